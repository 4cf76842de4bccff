#include "sim/DataSet.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

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
