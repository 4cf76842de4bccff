#include "platform/assistant/Model.h"
#include "platform/value/Json.h"
#include "support/Fakes.h"

#include <gtest/gtest.h>

#include <cmath>

namespace kyn {
namespace {

TEST(Model, RepliesHaveTheDocumentedDictionaryLayout) {
  EXPECT_EQ(AXCommandFailed::commandFailedWithErrorCode(AXKynLockedErrorCode)->dictionary(),
            Value::parse(R"({"class":"AXCommandFailed","errorCode":1004})"));
  EXPECT_EQ(AXCommandFailed::commandFailedWithReason("Need at least emails or current location")->dictionary(),
            Value::parse(R"({"class":"AXCommandFailed","reason":"Need at least emails or current location"})"));

  auto person = test::makePerson({"ada@example.test"}, {}, "Ada Lovelace");
  auto attribute = std::make_shared<AXPersonAttribute>();
  attribute->object = person;
  attribute->data = "ada@example.test";
  auto location = std::make_shared<AXKynLocation>();
  location->friend_ = attribute;
  location->latitude = 37.33;
  location->longitude = 0.0;  // zero is a value, not an absence
  location->locationDate = std::nan("");  // not representable in JSON: left out
  auto reply = AXKynSearchCompleted::searchCompleted();
  reply->kynLocations = std::vector{location};
  reply->atRequestedLocation = false;
  reply->searchContext = "kynServerContext://serverContext?";
  EXPECT_EQ(reply->dictionary(), Value::parse(R"({
    "class":"AXKynSearchCompleted",
    "kynLocations":[{"class":"AXKynLocation",
      "friend":{"class":"AXPersonAttribute",
        "object":{"class":"AXPerson","fullName":"Ada Lovelace",
                  "emails":[{"class":"AXEmail","emailAddress":"ada@example.test"}]},
        "data":"ada@example.test"},
      "latitude":37.33,"longitude":0.0}],
    "atRequestedLocation":false,
    "searchContext":"kynServerContext://serverContext?"})"));

  // The host gets the reply as text written from the record: the same text as the dictionary's,
  // escapes, broken UTF-8 and number forms included.
  person->fullName = "\"Ada\"\\ \n\x01\x7F \xC3\xA9 \xFF\xC3 \xF0\x9F\x98\x80";
  location->latitude = -0.0;
  location->longitude = 1e21;
  location->locationDate = 1763740500000.5;
  reply->atRequestedLocation.reset();
  EXPECT_EQ(AXReply(reply).json(), platform::toJson(reply->dictionary()));
}

TEST(Model, CommandsReadBackFromTheirDictionary) {
  const auto text = R"({"class":"AXKynGeoFenceSet",
    "friend":{"class":"AXPerson","phones":[{"class":"AXPhone","number":"+1 408 555 0100"}]},
    "requestedLocation":{"class":"AXLocation","label":"Home","latitude":48.85,"longitude":2.35},
    "geoFenceTrigger":"OnArrival","oneTimeOnly":true,"enable":1})";
  auto command = AXKynGeoFenceSet::fromDictionary(Value::parse(text));
  ASSERT_TRUE(command->friend_);
  EXPECT_EQ(command->friend_->phones->at(0)->number, "+1 408 555 0100");
  EXPECT_EQ(command->requestedLocation->label, "Home");
  EXPECT_EQ(std::tuple(command->oneTimeOnly, command->enable), std::tuple(true, true));
  EXPECT_FALSE(command->fenceType);
  EXPECT_EQ(command->dictionary(), AXKynGeoFenceSet::fromDictionary(command->dictionary())->dictionary());
}

TEST(Model, ValuesOfTheWrongTypeAreLeftAbsent) {
  auto search = AXKynSearch::fromDictionary(Value::parse(R"({"friends":[{"emails":"not-an-array","firstName":7}, 42, null],
    "currentLocation":"here","proximity":{"near":true},"requestedLocation":{"latitude":"48.85","longitude":1e308}})"));
  ASSERT_TRUE(search->friends);
  ASSERT_EQ(search->friends->size(), 1u);  // non-objects skipped
  EXPECT_FALSE(search->friends->at(0)->emails || search->friends->at(0)->firstName);
  EXPECT_FALSE(search->currentLocation || search->proximity || search->requestedLocation->latitude);
  EXPECT_EQ(search->requestedLocation->longitude, 1e308);
}

}  // namespace
}  // namespace kyn
