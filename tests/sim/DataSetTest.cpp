#include "sim/DataSet.h"
#include "sim/Files.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace kyn::sim {
namespace {

// The demo signs in as Sam and as Ada with the account files beside the data set, and names every
// friend from the demo address book.
TEST(DataSetTest, TheDemoDataSetLoadsAndAgreesWithTheDemoAccountsAndContacts) {
  const DataSet data = parseDataSet(readFile(KYN_SIM_DEMO_DIR "/friends.json"));
  const AccountView sam = data.view(0);
  ASSERT_EQ(sam.friends.size(), 6u);
  EXPECT_EQ(sam.friends.front().handle, "ada@example.com");  // document order is kept
  EXPECT_EQ(std::count_if(sam.friends.begin(), sam.friends.end(), [](const Friend& f) { return f.pending; }), 1);
  for (const auto& f : sam.friends) {
    EXPECT_TRUE(f.pending || (f.whereabouts.coordinate && f.whereabouts.ageSeconds)) << f.handle;
  }
  EXPECT_EQ(data.serverContext, Json({{"minCallbackIntervalInMS", 5000}}));

  std::string cards;
  for (const auto& card : std::filesystem::directory_iterator(KYN_SIM_DEMO_DIR "/contacts")) {
    cards += readFile(card.path());
  }
  for (const char* file : {"account.json", "ada-account.json"}) {
    const Json account = Json::parse(readFile(std::string(KYN_SIM_DEMO_DIR "/") + file));
    const auto holder = data.holder(account["username"].get<std::string>());
    ASSERT_NE(holder, nullptr) << file;
    const std::size_t number = static_cast<std::size_t>(holder - data.accounts.data());
    if (number > 0) {
      EXPECT_EQ(holder->personId, account["personId"]) << file;
    }
    EXPECT_FALSE(data.view(number).friends.empty()) << file;
    for (const auto& f : holder->friends) {
      if (isEmailHandle(f.handle)) {
        EXPECT_NE(cards.find(":" + f.handle + "\r\n"), std::string::npos) << f.handle;
      }
    }
  }
  EXPECT_TRUE(data.view(1).findFriend("sam@example.com")->whereabouts.coordinate);  // Ada sees Sam
}

TEST(DataSetTest, FriendsAreFoundByHandle) {
  const AccountView data =
      parseDataSet(R"({"friends": {"Ada@Example.com": {}, "+15035550101": {"pending": true}}})").view(0);
  ASSERT_NE(data.findFriend("ada@example.COM"), nullptr);  // e-mail addresses ignore case
  EXPECT_EQ(data.findFriend("ada@example.COM")->handle, "Ada@Example.com");
  ASSERT_NE(data.findFriend("+15035550101"), nullptr);
  EXPECT_TRUE(data.findFriend("+15035550101")->pending);
  EXPECT_EQ(data.findFriend("15035550101"), nullptr);
  EXPECT_EQ(data.findFriend("bob@example.com"), nullptr);
  EXPECT_FALSE(data.findFriend("+15035550101")->whereabouts.location);
}

TEST(DataSetTest, DefaultsWithoutFriendsOrContext) {
  const DataSet data = parseDataSet("{}");
  ASSERT_EQ(data.accounts.size(), 1u);
  EXPECT_TRUE(data.accounts[0].friends.empty());
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

  // Accounts, places and the gazetteer.
  EXPECT_NE(message(R"({"me": {"location": {"latitude": 1, "longitude": 2}}})").find("handle"), std::string::npos);
  EXPECT_NE(message(R"({"me": {"handle": "a@example.com"}, "friends": {"A@example.com": {}}})").find("own friend"),
            std::string::npos);
  EXPECT_NE(message(R"({"friends": {"a@example.com": {"ageSeconds": 1}},
                        "accounts": {"2": {"friends": {"a@example.com": {"ageSeconds": 2}}}}})")
                .find("given in friends.a@example.com already"),
            std::string::npos);
  EXPECT_NE(message(R"({"accounts": {"2": {"me": {"handle": "a@example.com"}},
                                     "3": {"me": {"handle": "a@example.com"}}}})")
                .find("two accounts"),
            std::string::npos);
  EXPECT_NE(message(R"({"accounts": {"2:3": {}}})").find("colon"), std::string::npos);
  EXPECT_NE(message(R"({"me": {"handle": "a@example.com", "places": {"Work": {"latitude": 1}}}})")
                .find("me.places.Work"),
            std::string::npos);
  EXPECT_NE(message(R"({"gazetteer": [{"latitude": 1, "longitude": 2, "locality": "Portland"}]})")
                .find("streetAddress"),
            std::string::npos);
}

}  // namespace
}  // namespace kyn::sim
