// "Tell me when Ada gets to work", through the command-line host and the plug-in to kyn-sim, which
// then really notifies when Ada arrives.
#include "Harness.h"

#include <gtest/gtest.h>

#include <fstream>

namespace kyn::itest {
namespace {

const Json kWorld = Json::parse(R"({
  "me": {"handle": "sam@example.com",
         "places": {"Work": {"latitude": 45.5231, "longitude": -122.6765}}},
  "friends": {"ada@example.com": {"location": {"latitude": 45.5152, "longitude": -122.6784}, "ageSeconds": 60}}
})");
const char* kAdaCard =
    "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:ada-1\r\nFN:Ada Marlowe\r\nN:Marlowe;Ada;;;\r\n"
    "EMAIL:ada@example.com\r\nEND:VCARD\r\n";

std::vector<Json> linesOf(const std::filesystem::path& file) {
  std::vector<Json> out;
  std::ifstream in(file);
  for (std::string line; std::getline(in, line);) {
    if (!line.empty()) out.push_back(Json::parse(line));
  }
  return out;
}

TEST(GeoFenceEndToEnd, ANotificationIsSetFiresAndIsSwitchedOff) {
  test::TempDir simDir, configDir;
  const auto control = simDir.path() / "control.json", notifications = simDir.path() / "notifications.jsonl";
  Sim sim(simDir.path(), kWorld,
          {"--control-file", control.string(), "--notifications-file", notifications.string()});
  Account account(configDir.path());
  account.write("localhost:" + std::to_string(sim.port()), sim.caFile());
  account.addCard("ada.vcf", kAdaCard);
  const std::string config = configDir.path().string();
  auto notify = [&](std::vector<std::string> args) {
    args.insert(args.begin(), {KYN_CLI_PATH, "--config", config});
    return runProgram(args);
  };
  auto move = [&](const char* lat, const char* lon) {
    EXPECT_EQ(runProgram({KYN_SIM_PATH, "move", "--control", control.string(), "ada@example.com", lat, lon}).status, 0);
  };

  const auto set = notify({"notify", "--friend", "Ada", "--arrives", "--place", "Work"});
  EXPECT_EQ(set.status, 0);
  EXPECT_EQ(set.output, "I'll tell you when Ada Marlowe arrives at Work.\n");
  move("45.5232", "-122.6766");
  auto sent = linesOf(notifications);
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_EQ(sent[0]["about"], "ada@example.com");
  EXPECT_EQ(sent[0]["to"], Json::array({"sam@example.com"}));
  EXPECT_EQ(sent[0]["transition"], "enter");
  EXPECT_EQ(sent[0]["place"], "Work");

  const auto off = notify({"--language", "de", "notify", "--friend", "Ada", "--arrives", "--place", "Work", "--off"});
  EXPECT_EQ(off.status, 0);
  EXPECT_EQ(off.output, "Ich sage dir nicht mehr Bescheid, wenn Ada Marlowe bei „Work“ ankommt.\n");
  move("45.5152", "-122.6784");
  move("45.5232", "-122.6766");
  EXPECT_EQ(linesOf(notifications).size(), 1u) << "a fence switched off fired";

  // A place the server cannot find fails (exit status 1); an address the host cannot read is a usage error.
  const auto unknown = notify({"notify", "--friend", "Ada", "--leaves", "--address", "9 Nowhere Road, Atlantis"});
  EXPECT_EQ(unknown.status, 1);
  EXPECT_EQ(unknown.output, "That address could not be found.\n");
  EXPECT_EQ(notify({"notify", "--friend", "Ada", "--leaves", "--address", "Atlantis"}).status, 2);
}

}  // namespace
}  // namespace kyn::itest
