// Showing and hiding the user's location, from the host through the plug-in to kyn-sim and back, and
// as a friend then sees it.
#include "Harness.h"

#include <gtest/gtest.h>

#include <fstream>

namespace kyn::itest {
namespace {

// Sam (the harness's account) and Ada, who signs in too and has Sam as a friend.
const Json kWorld = Json::parse(R"({
  "me": {"handle": "sam@example.com", "ageSeconds": 30,
         "location": {"latitude": 45.5231, "longitude": -122.6765, "horizontalAccuracy": 30.0}},
  "friends": {"ada@example.com": {"location": {"latitude": 45.5152, "longitude": -122.6784}, "ageSeconds": 300}},
  "accounts": {"P-2000002": {"me": {"handle": "ada@example.com"}, "friends": {"sam@example.com": {}}}}
})");
constexpr const char* kAdaPerson = "P-2000002";
constexpr const char* kAdaToken = "tok-ada-3b7e";

std::string visibility(bool visible) { return Json{{"class", "AXKynVisibilityStateSet"}, {"visible", visible}}.dump(); }

class VisibilityEndToEnd : public ::testing::Test {
 protected:
  void start(std::vector<std::string> simArgs = {}) {
    simArgs.insert(simArgs.end(), {"--account", std::string(kAdaPerson) + ":" + simDir.write("ada-token", kAdaToken).string()});
    sim = std::make_unique<Sim>(simDir.path(), kWorld, std::move(simArgs));
    account.write("localhost:" + std::to_string(sim->port()), sim->caFile());
  }

  test::TempDir simDir;
  test::TempDir configDir;
  Account account{configDir.path()};
  std::unique_ptr<Sim> sim;
};

TEST_F(VisibilityEndToEnd, AfterARedirectTheNextRequestGoesToTheNewHostAndNoFlagIsNoRequest) {
  start({"--canonical-host", "127.0.0.1"});
  Plugin plugin;
  plugin.configure(configDir.path());
  // A flag that is no yes/no would read as "hide": refused, and nothing is sent.
  const auto refused = plugin.performAndWait(R"({"class":"AXKynVisibilityStateSet","visible":"yes"})");
  ASSERT_TRUE(refused);
  EXPECT_TRUE(refused->contains("reason")) << refused->dump();
  for (bool visible : {false, true}) {
    const auto reply = plugin.performAndWait(visibility(visible));
    ASSERT_TRUE(reply);
    EXPECT_EQ((*reply)["class"], "AXKynVisibilitySetCompleted") << reply->dump();
  }
  plugin.shutdown();
  EXPECT_EQ(plugin.replyCounts(), (std::vector<int>{1, 1, 1}));
  std::vector<std::string> hosts;
  for (const auto& r : sim->requests()) hosts.push_back(r.value("host", ""));
  const std::string port = std::to_string(sim->port());
  EXPECT_EQ(hosts, (std::vector<std::string>{"localhost:" + port, "127.0.0.1:" + port, "127.0.0.1:" + port}));
  const auto prefs = Json::parse(std::ifstream(configDir.path() / "preferences" / "com.zanto.tessel.kyn.assistant.json"));
  EXPECT_EQ(prefs["RedirectedHostKey"], "127.0.0.1:" + port);
}

TEST_F(VisibilityEndToEnd, AFriendStopsSeeingTheLocationUntilItIsShownAgain) {
  start();
  const std::string sam = configDir.path().string();
  const test::TempDir adaDir;
  host::SpawnOptions token;
  token.input = std::string(kAdaToken) + "\n";
  ASSERT_EQ(runProgram({KYN_CLI_PATH, "--config", adaDir.path().string(), "account", "login", "--person-id", kAdaPerson,
                        "--username", "ada@example.com", "--host", "localhost:" + std::to_string(sim->port())},
                       token)
                .status,
            0);
  adaDir.write("config.json", Json{{"caFile", sim->caFile().string()}}.dump(), 0644);
  // Where Ada sees Sam: his latitude, or nothing while he hides.
  auto samSeenByAda = [&]() -> Json {
    const auto seen = runProgram({KYN_CLI_PATH, "--config", adaDir.path().string(), "--json", "search", "--friend",
                                  "sam@example.com"});
    EXPECT_EQ(seen.status, 0) << seen.output;
    const Json reply = Json::parse(seen.output, nullptr, false);
    return reply.is_object() ? reply["kynLocations"][0].value("latitude", Json()) : Json();
  };
  EXPECT_EQ(samSeenByAda(), 45.5231);

  const auto hidden = runProgram({KYN_CLI_PATH, "--config", sam, "visibility", "hide"});
  EXPECT_EQ(hidden.status, 0);
  EXPECT_EQ(hidden.output, "Your location is now hidden from your friends.\n");
  EXPECT_EQ(samSeenByAda(), Json());

  const auto shown = runProgram({KYN_CLI_PATH, "--config", sam, "--language", "fr", "visibility", "show"});
  EXPECT_EQ(shown.status, 0);
  EXPECT_EQ(shown.output, "Vos amis peuvent de nouveau voir votre position.\n");
  EXPECT_EQ(samSeenByAda(), 45.5231);

  EXPECT_EQ(runProgram({KYN_CLI_PATH, "--config", sam, "visibility", "sideways"}).status, 2);  // not taken as "hide"
}

}  // namespace
}  // namespace kyn::itest
