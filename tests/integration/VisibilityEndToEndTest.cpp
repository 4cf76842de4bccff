// Showing and hiding the user's location, from the host through the plug-in to kyn-sim and back, and
// as a friend then sees it.
#include "Harness.h"

#include <gtest/gtest.h>

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

TEST(VisibilityEndToEnd, AFriendStopsSeeingTheLocationUntilItIsShownAgain) {
  test::TempDir simDir, configDir;
  const auto sim = std::make_unique<Sim>(
      simDir.path(), kWorld,
      std::vector<std::string>{"--account", std::string(kAdaPerson) + ":" + simDir.write("ada-token", kAdaToken).string()});
  Account(configDir.path()).write("localhost:" + std::to_string(sim->port()), sim->caFile());
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
