// The command-line host's notify and visibility commands, through the plug-in to kyn-sim and back:
// "tell me when Ada gets to work", which kyn-sim then really notifies when Ada arrives, and hiding
// the user's location as a friend then sees it.
#include "Harness.h"

#include <gtest/gtest.h>

namespace kyn::itest {
namespace {

// Sam (the harness's account) and Ada, who signs in too and has Sam as a friend.
const Json kWorld = Json::parse(R"({
  "me": {"handle": "sam@example.com", "ageSeconds": 30, "location": {"latitude": 45.5231, "longitude": -122.6765},
         "places": {"Work": {"latitude": 45.5231, "longitude": -122.6765}}},
  "friends": {"ada@example.com": {"location": {"latitude": 45.5152, "longitude": -122.6784}, "ageSeconds": 60}},
  "accounts": {"P-2000002": {"me": {"handle": "ada@example.com"}, "friends": {"sam@example.com": {}}}}
})");
constexpr const char* kAdaPerson = "P-2000002";
constexpr const char* kAdaToken = "tok-ada-3b7e";
const char* kAdaCard =
    "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:ada-1\r\nFN:Ada Marlowe\r\nN:Marlowe;Ada;;;\r\n"
    "EMAIL:ada@example.com\r\nEND:VCARD\r\n";

TEST(GeoFenceEndToEnd, ANotificationIsSetFiresAndIsSwitchedOff) {
  test::TempDir simDir, configDir;
  const auto control = simDir.path() / "control.json", notifications = simDir.path() / "notifications.jsonl";
  Sim sim(simDir.path(), kWorld,
          {"--control-file", control.string(), "--notifications-file", notifications.string()});
  Account account(configDir.path());
  account.write("localhost:" + std::to_string(sim.port()), sim.caFile());
  account.addCard("ada.vcf", kAdaCard);
  auto notify = [&](std::vector<std::string> args) { return runHost(configDir.path(), std::move(args)); };
  auto move = [&](const char* lat, const char* lon) {
    EXPECT_EQ(runProgram({KYN_SIM_PATH, "move", "--control", control.string(), "ada@example.com", lat, lon}).status, 0);
  };

  const auto set = notify({"notify", "--friend", "Ada", "--arrives", "--place", "Work"});
  EXPECT_EQ(set.status, 0);
  EXPECT_EQ(set.output, "I'll tell you when Ada Marlowe arrives at Work.\n");
  move("45.5232", "-122.6766");
  auto sent = readJsonLines(notifications);
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_EQ(sent[0]["about"], "ada@example.com");
  EXPECT_EQ(sent[0]["transition"], "enter");

  const auto off = notify({"--language", "de", "notify", "--friend", "Ada", "--arrives", "--place", "Work", "--off"});
  EXPECT_EQ(off.status, 0);
  EXPECT_EQ(off.output, "Ich sage dir nicht mehr Bescheid, wenn Ada Marlowe bei „Work“ ankommt.\n");
  move("45.5152", "-122.6784");
  move("45.5232", "-122.6766");
  EXPECT_EQ(readJsonLines(notifications).size(), 1u) << "a fence switched off fired";

  // A place the server cannot find fails (exit status 1); an address the host cannot read is a usage error.
  const auto unknown = notify({"notify", "--friend", "Ada", "--leaves", "--address", "9 Nowhere Road, Atlantis"});
  EXPECT_EQ(unknown.status, 1);
  EXPECT_EQ(unknown.output, "That address could not be found.\n");
  EXPECT_EQ(notify({"notify", "--friend", "Ada", "--leaves", "--address", "Atlantis"}).status, 2);
}

TEST(VisibilityEndToEnd, AFriendStopsSeeingTheLocationUntilItIsShownAgain) {
  test::TempDir simDir, configDir;
  const auto sim = std::make_unique<Sim>(
      simDir.path(), kWorld,
      std::vector<std::string>{"--account", std::string(kAdaPerson) + ":" + simDir.write("ada-token", kAdaToken).string()});
  Account(configDir.path()).write("localhost:" + std::to_string(sim->port()), sim->caFile());
  const test::TempDir adaDir;
  Account(adaDir.path())
      .write("localhost:" + std::to_string(sim->port()), sim->caFile(), Json::object(), kAdaPerson, kAdaToken);
  // Where Ada sees Sam: his latitude, or nothing while he hides.
  auto samSeenByAda = [&]() -> Json {
    const auto seen = runHost(adaDir.path(), {"--json", "search", "--friend", "sam@example.com"});
    EXPECT_EQ(seen.status, 0) << seen.output;
    const Json reply = Json::parse(seen.output, nullptr, false);
    return reply.is_object() ? reply["kynLocations"][0].value("latitude", Json()) : Json();
  };
  EXPECT_EQ(samSeenByAda(), 45.5231);

  const auto hidden = runHost(configDir.path(), {"visibility", "hide"});
  EXPECT_EQ(hidden.status, 0);
  EXPECT_EQ(hidden.output, "Your location is now hidden from your friends.\n");
  EXPECT_EQ(samSeenByAda(), Json());

  const auto shown = runHost(configDir.path(), {"--language", "fr", "visibility", "show"});
  EXPECT_EQ(shown.status, 0);
  EXPECT_EQ(shown.output, "Vos amis peuvent de nouveau voir votre position.\n");
  EXPECT_EQ(samSeenByAda(), 45.5231);

  EXPECT_EQ(runHost(configDir.path(), {"visibility", "sideways"}).status, 2);  // not taken as "hide"
}

}  // namespace
}  // namespace kyn::itest
