#include "sim/DataSet.h"
#include "sim/Files.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

TEST(DataSetTest, TheDemoDataSetLoads) {
  const DataSet data = parseDataSet(readFile(KYN_SIM_DEMO_DIR "/friends.json"));
  ASSERT_EQ(data.friends.size(), 6u);
  EXPECT_EQ(data.friends.front().handle, "ada@example.com");  // document order is kept
  EXPECT_EQ(std::count_if(data.friends.begin(), data.friends.end(), [](const Friend& f) { return f.pending; }), 1);
  for (const auto& f : data.friends) {
    EXPECT_TRUE(f.pending || (f.coordinate && f.ageSeconds)) << f.handle;
  }
  EXPECT_EQ(data.serverContext, Json({{"minCallbackIntervalInMS", 5000}}));
}

TEST(DataSetTest, FriendsAreFoundByHandle) {
  const DataSet data = parseDataSet(R"({"friends": {"Ada@Example.com": {}, "+15035550101": {"pending": true}}})");
  ASSERT_NE(data.findFriend("ada@example.COM"), nullptr);  // e-mail addresses ignore case
  EXPECT_EQ(data.findFriend("ada@example.COM")->handle, "Ada@Example.com");
  ASSERT_NE(data.findFriend("+15035550101"), nullptr);
  EXPECT_TRUE(data.findFriend("+15035550101")->pending);
  EXPECT_EQ(data.findFriend("15035550101"), nullptr);
  EXPECT_EQ(data.findFriend("bob@example.com"), nullptr);
  EXPECT_FALSE(data.findFriend("+15035550101")->location);
}

TEST(DataSetTest, DefaultsWithoutFriendsOrContext) {
  const DataSet data = parseDataSet("{}");
  EXPECT_TRUE(data.friends.empty());
  EXPECT_EQ(data.serverContext, Json({{"minCallbackIntervalInMS", 5000}}));
}

TEST(DataSetTest, MistakesAreRejectedWithTheirPlace) {
  const auto message = [](const char* text) -> std::string {
    try {
      (void)parseDataSet(text);
    } catch (const std::invalid_argument& e) {
      return e.what();
    }
    return "accepted";
  };
  EXPECT_NE(message(R"({"friends": )").find("not valid JSON"), std::string::npos);
  EXPECT_NE(message("[]").find("object"), std::string::npos);
  EXPECT_NE(message(R"({"friends": []})").find("friends"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"(503) 555-0101": {}}})").find("E.164"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"+05035550101": {}}})").find("E.164"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"location": {"latitude": 1}}}})").find("longitude"),
            std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"location": {"latitude": 91, "longitude": 0}}}})")
                .find("out of range"),
            std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"location": {"latitude": 1, "longitude": 2, "timestamp": 3}}}})")
                .find("location.timestamp"),
            std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"ageSeconds": 5, "timestamp": 6}}})").find("not both"),
            std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"ageSeconds": -1}}})").find("negative"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"ageSeconds": 1.5}}})").find("whole"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"pending": "yes"}}})").find("pending"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"locaton": {}}}})").find("locaton"), std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {}, "A@example.com": {}}})").find("twice"), std::string::npos);
  EXPECT_NE(message(R"({"serverContext": 5})").find("serverContext"), std::string::npos);
}

}  // namespace
}  // namespace kyn::sim
