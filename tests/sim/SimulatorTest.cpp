// The program itself. What it answers over HTTPS is covered by the end-to-end tests of the plug-in.
#include "sim/Files.h"
#include "sim/Router.h"
#include "host/Process.h"

#include <httplib.h>

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <sstream>
#include <thread>


namespace kyn::sim {
namespace {

constexpr const char* kPerson = "1000000001";
constexpr const char* kToken = "s3cret-Token-41";
constexpr const char* kData = R"({"friends": {"ada@example.com": {"location": {"latitude": 45.5, "longitude": -122.6,
                                  "address": {"locality": "Portland"}}, "ageSeconds": 60}}})";
constexpr const char* kBody = R"({"clientContext": {"locale": "en-US"}, "handles": ["ada@example.com"]})";

// A client that trusts only the CA the server wrote, and checks the host name against it.
httplib::Result post(const std::filesystem::path& ca, const std::string& address, int port, const std::string& token) {
  httplib::SSLClient client(address, port);
  client.set_ca_cert_path(ca.c_str());
  client.enable_server_certificate_verification(true);
  client.set_basic_auth(kPerson, token.c_str());
  client.set_read_timeout(std::chrono::seconds(20));
  return client.Post(std::string(kGetLocationsPath).c_str(), httplib::Headers{{"X-Zanto-Vorn-API-Ver", "4.0"}}, kBody,
                     "application/json");
}

// The program itself: ready line, port file, SIGTERM, exit status, and no token in its output.
class ProgramTest : public ::testing::Test {
 protected:
  /// kyn-sim with `args`; its standard error goes to a file of its own in the test's directory.
  std::unique_ptr<host::Process> spawn(std::vector<std::string> args) {
    args.insert(args.begin(), KYN_SIM_BINARY);
    host::SpawnOptions options;
    options.captureOutput = true;
    options.errorFile = dir.path() / ("stderr-" + std::to_string(++spawned_));
    options.environment = {std::string("KYN_SIM_TOKEN=") + kToken};  // the token travels in the child's environment only
    options.endWithParent = true;
    return std::make_unique<host::Process>(args, options);
  }
  /// What the last program spawned wrote on standard error.
  std::string errors() const { return readFile(dir.path() / ("stderr-" + std::to_string(spawned_))); }

  host::TempDir dir;
  int spawned_ = 0;
};

TEST_F(ProgramTest, MoveReachesTheRunningServerThroughItsControlFile) {
  writeFileAtomically(dir.path() / "friends.json", kData);
  const auto control = dir.path() / "control.json";
  auto server = spawn({"--person", kPerson, "--data", (dir.path() / "friends.json").string(), "--ca-out",
                       (dir.path() / "ca.pem").string(), "--control-file", control.string()});
  const std::string ready = server->readLine().value_or("");
  const int port = std::stoi(ready.substr(ready.rfind(':') + 1));
  EXPECT_EQ(std::filesystem::status(control).permissions() & std::filesystem::perms::all,
            std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);  // it holds the secret

  auto move = spawn({"move", "--control", control.string(), "ada@example.com", "-33.9", "-70.5"});
  const std::string moved = move->readAll();
  EXPECT_EQ(move->wait(), 0) << errors();
  EXPECT_EQ(Json::parse(moved)["location"]["longitude"], -70.5);
  auto res = post(dir.path() / "ca.pem", "127.0.0.1", port, kToken);
  ASSERT_TRUE(res);
  EXPECT_EQ(Json::parse(res->body)["locations"]["ada@example.com"]["location"]["latitude"], -33.9);

  move = spawn({"move", "--control", control.string(), "eve@example.com", "1", "2"});
  (void)move->readAll();
  EXPECT_EQ(move->wait(), 1);
  EXPECT_NE(errors().find("eve@example.com"), std::string::npos);

  EXPECT_EQ(server->stop(), 0);
}

TEST_F(ProgramTest, AMissingDataSetIsAStartupError) {
  auto run = spawn({"--person", kPerson, "--data", (dir.path() / "nothing.json").string()});
  EXPECT_EQ(run->readAll(), "");
  EXPECT_EQ(run->wait(), 2);
  const std::string err = errors();
  EXPECT_NE(err.find("nothing.json"), std::string::npos) << err;
  EXPECT_EQ(err.find(kToken), std::string::npos);
}

}  // namespace
}  // namespace kyn::sim
