#include "commands/SetGeoFenceCmd.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

class SetGeoFenceCmdTest : public test::PlatformTest {
 protected:
  /// Ada's office: a full address and a coordinate.
  static std::shared_ptr<AXLocation> office() {
    return AXLocation::fromDictionary(Value::parse(R"({"label":"Office","street":"1 Example Way",
        "thoroughfare":"Example Way","city":"Portland","stateCode":"OR","postalCode":"97204","countryCode":"US",
        "latitude":45.5152,"longitude":-122.6784,"accuracy":65.0})"));
  }
  static std::shared_ptr<SetGeoFenceCmd> fenceFor(std::shared_ptr<AXLocation> place, bool enable) {
    auto command = std::make_shared<SetGeoFenceCmd>();
    command->axPerson = test::makePerson({"ada@example.com"}, {"(503) 555-0101"});
    command->setLocation(place);
    command->trigger = std::string(AXKynGeoFenceTriggerOnArrivalValue);
    command->enable = enable;
    return command;
  }
  static std::shared_ptr<AXKynGeoFence> answered(SetGeoFenceCmd& command, const char* body) {
    command.setTransferResult(true, platform::HTTPResponse{200});
    command.setResponseBody(body);
    return command.result();
  }
};

TEST_F(SetGeoFenceCmdTest, TheBodyCarriesEveryKeyInItsOrder) {
  auto command = fenceFor(office(), true);
  command->trigger = std::string(AXKynGeoFenceTriggerImmediateValue);
  command->onetimeonly = true;
  command->fenceType = std::string(AXKynFenceTypeNotifyMeValue);
  Value body = command->jsonBodyDictionary();
  EXPECT_EQ(body["requestedLocation"]["horizontalAccuracy"], 65.0);
  body["requestedLocation"] = body["requestedLocation"]["latitude"];
  body.erase("clientContext");
  // Ordered values compare in order: the keys come as listed. The postal code is only in the text.
  EXPECT_EQ(body, Value::parse(R"({"emails":["+15035550101","ada@example.com"],"requestedLocation":45.5152,
      "label":"Office","isOn":"true","address":"1 Example Way\nPORTLAND, OR 97204","trigger":"immediate",
      "onetimeonly":"true","fullAddress":{"streetAddress":"1 Example Way","streetName":"Example Way",
      "locality":"Portland","stateCode":"OR","country":"US","formattedAddressLines":["1 Example Way\nPORTLAND, OR 97204"]},
      "locationType":"4","type":"NotifyMe"})"));
}

TEST_F(SetGeoFenceCmdTest, PlacesWithLessAddressAndTheOtherValues) {
  struct Row {
    std::optional<std::string> street, thoroughfare, trigger, fenceType;
    const char* sentTrigger;
  };
  const Row rows[] = {
      {"1 Example Way", std::nullopt, std::string(AXKynGeoFenceTriggerOnArrivalValue), std::nullopt, "enter"},
      {std::nullopt, "Example Way", std::string(AXKynGeoFenceTriggerOnDepartureValue), "Others", "exit"},
      {std::nullopt, std::nullopt, "enter", "NotifyMe", ""},
      {std::nullopt, std::nullopt, std::nullopt, std::nullopt, ""},
  };
  for (const auto& row : rows) {
    auto place = office();
    place->street = row.street;
    place->thoroughfare = row.thoroughfare;
    auto command = fenceFor(place, false);
    command->trigger = row.trigger;
    command->fenceType = row.fenceType;
    const Value body = command->jsonBodyDictionary();
    const Value& full = body["fullAddress"];
    EXPECT_EQ(full.contains("streetAddress"), row.street.has_value()) << full;
    EXPECT_EQ(full.contains("streetName"), row.thoroughfare.has_value()) << full;
    EXPECT_EQ(body["trigger"], row.sentTrigger);
    EXPECT_EQ(body["type"], "NotifyOthers");
    EXPECT_EQ(body["isOn"], "false");
    EXPECT_EQ(body["onetimeonly"], "false");
  }

  // No place at all: nothing about it is sent but the empty address text.
  auto nowhere = fenceFor(nullptr, true);
  const Value body = nowhere->jsonBodyDictionary();
  for (const char* key : {"requestedLocation", "label", "fullAddress", "locationType"}) {
    EXPECT_FALSE(body.contains(key)) << key;
  }
  EXPECT_EQ(body["address"], "");
}

TEST_F(SetGeoFenceCmdTest, TheFenceComesBackWithTheServersPlace) {
  auto command = fenceFor(office(), true);
  const auto fence = answered(*command, R"({"statusCode":200,
      "fence":{"emails":["+15035550101","ada@example.com"],"latitude":45.52,"longitude":-122.67},
      "fullAddress":{"streetAddress":"2 Example Way"},"serverContext":{"clientId":"c"}})");
  EXPECT_EQ(fence->trigger, "OnArrival");
  EXPECT_EQ(fence->friend_->object, command->axPerson);
  EXPECT_EQ(fence->friend_->data, "ada@example.com");
  EXPECT_EQ(fence->location->dictionary(), Value::parse(R"({"class":"AXLocation","label":"Office",
      "street":"2 Example Way","latitude":45.52,"longitude":-122.67,"accuracy":0.0})"));
  EXPECT_EQ(command->contextIdentifierURL(), "kynServerContext://serverContext?clientId=c&");
}

TEST_F(SetGeoFenceCmdTest, ASwitchedOffFenceTakesItsPlaceFromTheRequestOnlyWhenOff) {
  const char* switchedOff = R"({"statusCode":221,"fence":null})";
  const auto off = answered(*fenceFor(office(), false), switchedOff)->location;
  EXPECT_EQ(off->latitude, 45.5152);
  EXPECT_EQ(off->longitude, -122.6784);
  EXPECT_EQ(off->street, "1 Example Way");
  const auto on = answered(*fenceFor(office(), true), switchedOff)->location;
  EXPECT_FALSE(on->latitude || on->longitude || on->street);
  const auto otherCode = answered(*fenceFor(office(), false), R"({"statusCode":200})")->location;
  EXPECT_FALSE(otherCode->latitude || otherCode->street);
}

TEST_F(SetGeoFenceCmdTest, AnEmptyLastHandleOrNoAnswerFallsBackToTheFriendsLastHandle) {
  auto command = fenceFor(office(), true);
  EXPECT_EQ(answered(*command, R"({"fence":{"emails":["+15035550101",""]}})")->friend_->data, "ada@example.com");
  auto silent = fenceFor(nullptr, true);
  silent->axPerson = test::makePerson({}, {"(503) 555-0101"});
  const auto fence = silent->result();  // nothing came back at all
  ASSERT_TRUE(fence);
  EXPECT_EQ(fence->friend_->data, "+15035550101");
  EXPECT_FALSE(fence->location->latitude);
  EXPECT_FALSE(silent->contextIdentifierURL());
}

}  // namespace
}  // namespace kyn
