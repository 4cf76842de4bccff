#include "sim/Settings.h"
#include "sim/World.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

constexpr std::int64_t kNow = 1'763'740'800'000;

// Sam (account 0) with Ada as a friend and a place "Work" 11 km north of home; Ada (account 1) with
// Sam as a friend.
const char* const kData = R"({
  "me": {"handle": "sam@example.com", "location": {"latitude": 45.0, "longitude": -122.0}, "ageSeconds": 10,
         "places": {"Work": {"latitude": 45.1, "longitude": -122.0}}},
  "friends": {"ada@example.com": {"location": {"latitude": 45.0, "longitude": -122.0}, "ageSeconds": 60}},
  "accounts": {"1000000002": {"me": {"handle": "ada@example.com"}, "friends": {"sam@example.com": {}}}}
})";

constexpr Coordinate kHome{45.0, -122.0};
constexpr Coordinate kWork{45.1, -122.0};

class WorldTest : public ::testing::Test {
 protected:
  static DataSet data() {
    DataSet d = parseDataSet(kData);
    d.accounts[0].personId = "1000000001";
    return d;
  }

  Json setFence(Json patch, std::size_t account = 0) {
    // Ada's second handle is no friend's.
    Json request = Json::parse(R"({"clientContext":{"locale":"en-US"},"emails":["ada@example.com","+15035550101"],
        "isOn":"true","address":"","trigger":"enter","onetimeonly":"false","type":"NotifyMe"})");
    request.update(patch);
    return answerGeoFence(world, account, request, kNow);
  }
  static Json at(Coordinate c, double accuracy = 10) {
    return {{"latitude", c.latitude}, {"longitude", c.longitude}, {"source", "assistant"}, {"horizontalAccuracy", accuracy}};
  }
  Json hide(std::size_t account, const Json& yesNo) {
    return answerShowHideLocation(world, account,
                                  {{"clientContext", Json::object()}, {"prefs", {{"hideLocation", yesNo}}}}, kNow);
  }
  // "fence transition" of each notification since the last call.
  std::vector<std::string> fired() {
    std::vector<std::string> out;
    for (const auto& n : notes) out.push_back(n["fence"].get<std::string>() + " " + n["transition"].get<std::string>());
    notes.clear();
    return out;
  }

  std::vector<Json> notes;
  World world{data(), [this](const Json& n) { notes.push_back(n); }};
};

TEST_F(WorldTest, FencesFireAsPeopleCrossThem) {
  // Ada is at home, inside the first two fences and outside the rest.
  setFence({{"requestedLocation", at(kHome)}, {"trigger", "immediate"}, {"onetimeonly", "true"}});  // fence-1
  setFence({{"requestedLocation", at(kHome)}, {"trigger", "exit"}, {"onetimeonly", "true"}});       // fence-2
  setFence({{"label", "Work"}});                                                                    // fence-3
  setFence({{"label", "Work"}, {"trigger", "immediate"}, {"onetimeonly", "true"}});                // fence-4
  // fence-5, Ada's own: tell Sam when she gets to work.
  setFence({{"emails", {"sam@example.com"}}, {"requestedLocation", at(kWork)}, {"type", "NotifyOthers"}}, 1);
  ASSERT_EQ(fired(), std::vector<std::string>{"fence-1 immediate"});

  ASSERT_TRUE(world.move("ADA@example.com", kWork, std::nullopt, kNow + 1000));
  EXPECT_EQ(fired(), (std::vector<std::string>{"fence-2 exit", "fence-3 enter", "fence-4 enter", "fence-5 enter"}));
  world.move("ada@example.com", kHome, std::nullopt, kNow + 2000);
  EXPECT_EQ(fired(), std::vector<std::string>{});  // the one-time fences are spent
  world.move("ada@example.com", kWork, std::nullopt, kNow + 3000);
  const Json last = notes.at(0);
  EXPECT_EQ(fired(), (std::vector<std::string>{"fence-3 enter", "fence-5 enter"}));
  EXPECT_EQ(last["account"], "1000000001");
  EXPECT_EQ(last["to"], Json({"sam@example.com"}));
  EXPECT_EQ(last["about"], "ada@example.com");
  EXPECT_EQ(last["place"], "Work");
  EXPECT_EQ(last["time"], "2025-11-21T16:00:03.000Z");

  // Hidden, Ada moves unseen; shown again, her fences judge where she is now.
  hide(1, "Yes");
  world.move("ada@example.com", kHome, std::nullopt, kNow + 4000);
  world.move("ada@example.com", kWork, std::nullopt, kNow + 5000);
  world.move("ada@example.com", kHome, std::nullopt, kNow + 6000);
  EXPECT_EQ(fired(), std::vector<std::string>{});
  hide(1, "No");
  EXPECT_EQ(fired(), std::vector<std::string>{});  // she left work unseen: fence-3 is for arrivals
  world.move("ada@example.com", kWork, std::nullopt, kNow + 7000);
  EXPECT_EQ(fired(), (std::vector<std::string>{"fence-3 enter", "fence-5 enter"}));

  EXPECT_FALSE(world.move("eve@example.com", kWork, std::nullopt, kNow));
}

}  // namespace
}  // namespace kyn::sim
