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
  const std::pair<const char*, const char*> cases[] = {
      {R"({"friends": )", "not valid JSON"},
      {"[]", "object"},
      {R"({"friends": []})", "friends"},
      {R"({"friends": {"(503) 555-0101": {}}})", "E.164"},
      {R"({"friends": {"+05035550101": {}}})", "E.164"},
      {R"({"friends": {"a@example.com": {"location": {"latitude": 1}}}})", "longitude"},
      {R"({"friends": {"a@example.com": {"location": {"latitude": 91, "longitude": 0}}}})", "out of range"},
      {R"({"friends": {"a@example.com": {"location": {"latitude": 1, "longitude": 2, "timestamp": 3}}}})",
       "location.timestamp"},
      {R"({"friends": {"a@example.com": {"ageSeconds": 5, "timestamp": 6}}})", "not both"},
      {R"({"friends": {"a@example.com": {"ageSeconds": -1}}})", "negative"},
      {R"({"friends": {"a@example.com": {"ageSeconds": 1.5}}})", "whole"},
      {R"({"friends": {"a@example.com": {"pending": "yes"}}})", "pending"},
      {R"({"friends": {"a@example.com": {"locaton": {}}}})", "locaton"},
      {R"({"friends": {"a@example.com": {}, "A@example.com": {}}})", "twice"},
      {R"({"serverContext": 5})", "serverContext"},
      // Accounts, places and the gazetteer.
      {R"({"me": {"location": {"latitude": 1, "longitude": 2}}})", "handle"},
      {R"({"me": {"handle": "a@example.com"}, "friends": {"A@example.com": {}}})", "own friend"},
      {R"({"friends": {"a@example.com": {"ageSeconds": 1}},
           "accounts": {"2": {"friends": {"a@example.com": {"ageSeconds": 2}}}}})",
       "given in friends.a@example.com already"},
      {R"({"accounts": {"2": {"me": {"handle": "a@example.com"}}, "3": {"me": {"handle": "a@example.com"}}}})",
       "two accounts"},
      {R"({"accounts": {"2:3": {}}})", "colon"},
      {R"({"me": {"handle": "a@example.com", "places": {"Work": {"latitude": 1}}}})", "me.places.Work"},
      {R"({"gazetteer": [{"latitude": 1, "longitude": 2, "locality": "Portland"}]})", "streetAddress"},
  };
  for (const auto& [text, named] : cases) {
    try {
      (void)parseDataSet(text);
      ADD_FAILURE() << "accepted: " << text;
    } catch (const std::invalid_argument& e) {
      EXPECT_NE(std::string(e.what()).find(named), std::string::npos) << e.what();
    }
  }
}

}  // namespace
}  // namespace kyn::sim
