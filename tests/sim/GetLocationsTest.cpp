#include "sim/GetLocations.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

constexpr std::int64_t kNow = 1'763'740'800'000;
constexpr double kMetresPerDegree = 111'195.08;

// Ada in Portland with an address and a label; Bram pending; Cleo with a fixed time; Dev without a
// location or time.
const char* const kData = R"({
  "friends": {
    "ada@example.com": {"location": {"latitude": 45.0, "longitude": -122.0, "horizontalAccuracy": 65.0,
                                     "streetAddress": "1 Example Way", "labels": [{"label": "Work"}],
                                     "address": {"locality": "Portland", "stateCode": "OR"}},
                        "ageSeconds": 300},
    "+15035550102": {"pending": true, "location": {"latitude": 45.0, "longitude": -122.0}},
    "cleo@example.org": {"location": {"latitude": 46.0, "longitude": -122.0}, "timestamp": 1700000000000},
    "dev@example.org": {}
  },
  "serverContext": {"minCallbackIntervalInMS": 7000, "region": "north"}
})";

class GetLocationsTest : public ::testing::Test {
 protected:
  AccountView data = parseDataSet(kData).view(0);

  Json ask(Json request) const {
    request["clientContext"] = Json{{"locale", "en-US"}};
    return answerGetLocations(data, request, kNow);
  }
  static Json at(double latitude, double longitude) {
    return Json{{"latitude", latitude}, {"longitude", longitude}, {"source", "assistant"}};
  }
  // A point `metres` north of Ada.
  static Json northOfAda(double metres) { return at(45.0 + metres / kMetresPerDegree, -122.0); }
};

TEST_F(GetLocationsTest, NoHandlesAnswersEveryFriendWithoutEmails) {
  for (const Json& request : {Json::object(), Json{{"handles", Json::array()}}}) {
    const Json answer = ask(request);
    EXPECT_EQ(answer["statusCode"], 416);  // Bram is pending
    EXPECT_FALSE(answer.contains("emails"));
    std::vector<std::string> keys;
    for (const auto& [key, value] : answer["locations"].items()) keys.push_back(key);
    EXPECT_EQ(keys,
              (std::vector<std::string>{"ada@example.com", "+15035550102", "cleo@example.org", "dev@example.org"}));
  }
}

TEST_F(GetLocationsTest, EmailsFollowTheRequestOrderOnceEach) {
  const Json answer =
      ask(Json{{"handles", {"cleo@example.org", "+15035550199", "ADA@example.com", "cleo@example.org"}}});
  EXPECT_EQ(answer["emails"], Json({"cleo@example.org", "+15035550199", "ADA@example.com"}));
  // Entries are keyed as the client wrote the handle, so that it finds them.
  EXPECT_EQ(answer["locations"]["ADA@example.com"]["status"], 200);
  EXPECT_EQ(answer["locations"].size(), 3u);
}

TEST_F(GetLocationsTest, MatchUsesTheProximityRadius) {
  const auto matches = [&](double metres, const char* proximity) {
    Json request{{"handles", {"ada@example.com"}}, {"requestedLocation", northOfAda(metres)}};
    if (proximity) request["proximity"] = proximity;
    return ask(request)["locations"]["ada@example.com"]["match"].get<bool>();
  };
  EXPECT_TRUE(matches(140, "at"));
  EXPECT_FALSE(matches(160, "at"));
  EXPECT_TRUE(matches(1990, "near"));
  EXPECT_FALSE(matches(2010, "near"));
  EXPECT_TRUE(matches(490, nullptr));
  EXPECT_FALSE(matches(510, nullptr));
  EXPECT_FALSE(matches(510, "around"));
  EXPECT_TRUE(matches(490, "AT"));  // the protocol's words are lower case: an unknown word
  // No requested place: no match, even right beside the friend.
  EXPECT_FALSE(ask(Json{{"handles", {"ada@example.com"}}, {"myLocation", at(45, -122)}})["locations"]
                   ["ada@example.com"]["match"]);
}

TEST_F(GetLocationsTest, DistanceIsATextAndOnlyWithMyLocation) {
  Json entry = ask(Json{{"handles", {"ada@example.com"}}, {"myLocation", northOfAda(1523.4)}})["locations"]
                      ["ada@example.com"];
  EXPECT_EQ(entry["distanceInMeters"], "1523.4");
  entry = ask(Json{{"handles", {"ada@example.com"}}, {"requestedLocation", northOfAda(10)}})["locations"]
                  ["ada@example.com"];
  EXPECT_FALSE(entry.contains("distanceInMeters"));
  entry = ask(Json{{"handles", {"dev@example.org"}}, {"myLocation", at(45, -122)}})["locations"]["dev@example.org"];
  EXPECT_EQ(entry, Json({{"status", 200}, {"match", false}, {"location", nullptr}}));
}

TEST_F(GetLocationsTest, TheLocationCarriesTheTimeOfTheFix) {
  const Json answer = ask(Json{{"handles", {"ada@example.com", "cleo@example.org"}}});
  const Json& ada = answer["locations"]["ada@example.com"]["location"];
  EXPECT_EQ(ada["timestamp"], kNow - 300'000);
  EXPECT_TRUE(ada["timestamp"].is_number_integer());
  EXPECT_EQ(ada.dump(),
            R"({"latitude":45.0,"longitude":-122.0,"horizontalAccuracy":65.0,"timestamp":1763740500000,)"
            R"("streetAddress":"1 Example Way","labels":[{"label":"Work"}],)"
            R"("address":{"locality":"Portland","stateCode":"OR"}})");
  EXPECT_EQ(answer["locations"]["cleo@example.org"]["location"]["timestamp"], 1'700'000'000'000);
  data.friends[2].whereabouts.timestampMs.reset();
  EXPECT_FALSE(ask(Json{{"handles", {"cleo@example.org"}}})["locations"]["cleo@example.org"]["location"].contains(
      "timestamp"));
}

TEST_F(GetLocationsTest, ServerContextAddsClientIdAndTheFakeToken) {
  Json answer = ask(Json{{"serverContext", {{"clientId", "c-17"}}}});
  EXPECT_EQ(answer["serverContext"], Json({{"minCallbackIntervalInMS", 7000},
                                           {"region", "north"},
                                           {"clientId", "c-17"},
                                           {"authToken", kServerContextAuthToken}}));
  data.serverContext = Json{{"minCallbackIntervalInMS", 5000}};
  answer = ask(Json::object());
  EXPECT_EQ(answer["serverContext"], Json({{"minCallbackIntervalInMS", 5000}, {"authToken", kServerContextAuthToken}}));
}

TEST_F(GetLocationsTest, RequestsOutsideTheProtocolAreBadRequests) {
  EXPECT_THROW((void)answerGetLocations(data, Json::array(), kNow), BadRequest);
  EXPECT_THROW((void)answerGetLocations(data, Json{{"handles", {"ada@example.com"}}}, kNow), BadRequest);
  EXPECT_THROW(ask(Json{{"handles", "ada@example.com"}}), BadRequest);
  EXPECT_THROW(ask(Json{{"handles", {"ada@example.com", 5}}}), BadRequest);
  EXPECT_THROW(ask(Json{{"myLocation", {{"latitude", 45}}}}), BadRequest);
  EXPECT_THROW(ask(Json{{"requestedLocation", "Home"}}), BadRequest);
  EXPECT_THROW(ask(Json{{"label", nullptr}}), BadRequest);  // optional members are left out, never null
  EXPECT_THROW(ask(Json{{"proximity", 2}}), BadRequest);
  EXPECT_THROW(ask(Json{{"serverContext", "c-17"}}), BadRequest);
}

}  // namespace
}  // namespace kyn::sim
