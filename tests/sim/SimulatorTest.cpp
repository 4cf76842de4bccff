// The program itself. What it answers over HTTPS is covered by the end-to-end tests of the plug-in.
#include "sim/Files.h"
#include "sim/Router.h"
#include "TempDir.h"

#include <httplib.h>

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <sstream>
#include <thread>

#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

extern char** environ;

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
  struct Run {
    pid_t pid = -1;
    int out = -1;
    int err = -1;
  };

  Run spawn(std::vector<std::string> args) {
    int out[2], err[2];
    EXPECT_EQ(::pipe(out), 0);
    EXPECT_EQ(::pipe(err), 0);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, out[1], 1);
    posix_spawn_file_actions_adddup2(&actions, err[1], 2);
    posix_spawn_file_actions_addclose(&actions, out[0]);
    posix_spawn_file_actions_addclose(&actions, err[0]);
    args.insert(args.begin(), KYN_SIM_BINARY);
    std::vector<char*> argv;
    for (auto& a : args) argv.push_back(a.data());
    argv.push_back(nullptr);
    // The token travels in the child's environment only.
    std::string token = std::string("KYN_SIM_TOKEN=") + kToken;
    std::vector<char*> env;
    for (char** e = environ; *e; ++e) env.push_back(*e);
    env.push_back(token.data());
    env.push_back(nullptr);
    Run run;
    EXPECT_EQ(posix_spawn(&run.pid, KYN_SIM_BINARY, &actions, nullptr, argv.data(), env.data()), 0);
    posix_spawn_file_actions_destroy(&actions);
    ::close(out[1]);
    ::close(err[1]);
    run.out = out[0];
    run.err = err[0];
    return run;
  }

  // Reads until a newline or the end; the time limit only guards against a hang.
  static std::string readLine(int fd) {
    std::string line;
    char c;
    pollfd p{fd, POLLIN, 0};
    while (::poll(&p, 1, 20'000) == 1 && ::read(fd, &c, 1) == 1 && c != '\n') line += c;
    return line;
  }
  static std::string readAll(int fd) {
    std::string text;
    char buffer[4096];
    for (ssize_t n; (n = ::read(fd, buffer, sizeof buffer)) > 0;) text.append(buffer, static_cast<std::size_t>(n));
    ::close(fd);
    return text;
  }
  static int exitStatus(pid_t pid) {
    int status = 0;
    ::waitpid(pid, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  }

  test::TempDir dir;
};

TEST_F(ProgramTest, ServesUntilSigtermAndExitsCleanly) {
  writeFileAtomically(dir / "friends.json", kData);
  Run run = spawn({"--person", kPerson, "--data", (dir / "friends.json").string(), "--port", "0", "--ca-out",
                   (dir / "ca.pem").string(), "--port-file", (dir / "port").string()});
  const std::string ready = readLine(run.out);
  const std::string port = readFile(dir / "port");
  EXPECT_EQ(ready, "kyn-sim listening on https://127.0.0.1:" + port.substr(0, port.size() - 1));

  auto res = post(dir / "ca.pem", "127.0.0.1", std::stoi(port), kToken);
  ASSERT_TRUE(res);
  EXPECT_EQ(res->status, 200);

  ::kill(run.pid, SIGTERM);
  EXPECT_EQ(exitStatus(run.pid), 0);
  const std::string output = readAll(run.out) + readAll(run.err);
  EXPECT_EQ(output, "");
}

TEST_F(ProgramTest, MoveReachesTheRunningServerThroughItsControlFile) {
  writeFileAtomically(dir / "friends.json", kData);
  const auto control = dir / "control.json";
  Run server = spawn({"--person", kPerson, "--data", (dir / "friends.json").string(), "--ca-out",
                      (dir / "ca.pem").string(), "--control-file", control.string()});
  const std::string ready = readLine(server.out);
  const int port = std::stoi(ready.substr(ready.rfind(':') + 1));
  EXPECT_EQ(std::filesystem::status(control).permissions() & std::filesystem::perms::all,
            std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);  // it holds the secret

  Run move = spawn({"move", "--control", control.string(), "ada@example.com", "-33.9", "-70.5"});
  EXPECT_EQ(exitStatus(move.pid), 0) << readAll(move.err);
  EXPECT_EQ(Json::parse(readAll(move.out))["location"]["longitude"], -70.5);
  auto res = post(dir / "ca.pem", "127.0.0.1", port, kToken);
  ASSERT_TRUE(res);
  EXPECT_EQ(Json::parse(res->body)["locations"]["ada@example.com"]["location"]["latitude"], -33.9);

  move = spawn({"move", "--control", control.string(), "eve@example.com", "1", "2"});
  EXPECT_EQ(exitStatus(move.pid), 1);
  EXPECT_NE(readAll(move.err).find("eve@example.com"), std::string::npos);
  readAll(move.out);

  ::kill(server.pid, SIGTERM);
  EXPECT_EQ(exitStatus(server.pid), 0);
  readAll(server.out);
  readAll(server.err);
}

TEST_F(ProgramTest, AMissingDataSetIsAStartupError) {
  Run run = spawn({"--person", kPerson, "--data", (dir / "nothing.json").string()});
  EXPECT_EQ(exitStatus(run.pid), 2);
  EXPECT_EQ(readAll(run.out), "");
  const std::string err = readAll(run.err);
  EXPECT_NE(err.find("nothing.json"), std::string::npos) << err;
  EXPECT_EQ(err.find(kToken), std::string::npos);
}

}  // namespace
}  // namespace kyn::sim
