#include "model/KYNAXLocation.h"
#include "platform/value/Json.h"
#include "support/PlatformTest.h"
#include "platform/localization/IcuLocalization.h"

namespace kyn {
namespace {

using platform::services;

class KYNAXLocationTest : public test::PlatformTest {
 protected:
  static std::shared_ptr<KYNAXLocation> decode(const char* json, std::optional<std::string> handle = "ada@example.com") {
    const Value entry = Value::parse(json);
    return KYNAXLocation::locationWithHandle(handle, std::make_shared<AXPerson>(), &entry);
  }
  static std::shared_ptr<KYNAXLocation> withFriend(std::vector<std::optional<std::string>> emails,
                                                   std::vector<std::optional<std::string>> phones,
                                                   std::optional<std::string> fullName = std::nullopt) {
    return KYNAXLocation::locationWithHandle("h", test::makePerson(std::move(emails), std::move(phones), std::move(fullName)),
                                             nullptr);
  }
};

TEST_F(KYNAXLocationTest, DecodesAFullEntry) {
  const auto record = decode(R"({"distanceInMeters":"1,523.5","status":200,"match":true,
    "location":{"latitude":45.5152,"longitude":-122.6784,"horizontalAccuracy":65,"timestamp":1763740500000,
                "streetAddress":"1 Example Way","labels":[{"label":"Work"}],
                "address":{"locality":"Portland","stateCode":"OR","administrativeArea":"Oregon"}}})");
  const auto& l = *record->avixLocation;
  EXPECT_EQ(l.distance, 1523.5);
  EXPECT_EQ(l.latitude, 45.5152);
  EXPECT_EQ(l.longitude, -122.6784);
  EXPECT_EQ(l.accuracy, 65.0);
  EXPECT_DOUBLE_EQ(*l.locationDate, 1763740500.0 - platform::kReferenceDateSince1970);
  EXPECT_EQ(l.street, "1 Example Way");
  EXPECT_EQ(l.label, "Work");
  EXPECT_EQ(l.city, "Portland");
  EXPECT_EQ(l.stateCode, "OR");
  ASSERT_TRUE(l.friend_);
  EXPECT_EQ(l.friend_->data, "ada@example.com");
  EXPECT_TRUE(record->hasCoordinate());
}

TEST_F(KYNAXLocationTest, ANullLocationLeavesEverythingButTheFriendAbsent) {
  for (const char* json : {R"({"location":null})", "{}", R"({"location":"somewhere"})", "null"}) {
    const auto record = decode(json);
    const auto& l = *record->avixLocation;
    EXPECT_TRUE(l.friend_) << json;
    EXPECT_FALSE(l.city || l.stateCode || l.latitude || l.longitude || l.accuracy || l.locationDate || l.street ||
                 l.label || l.distance)
        << json;
    EXPECT_FALSE(record->hasCoordinate());
    EXPECT_EQ(record->friendLocation(false), "Locating…");
    EXPECT_EQ(record->friendLocation(true), "No location found");
  }
  const auto noEntry = KYNAXLocation::locationWithHandle("ada@example.com", std::make_shared<AXPerson>(), nullptr);
  EXPECT_TRUE(noEntry->avixLocation->friend_);
  EXPECT_FALSE(noEntry->avixLocation->latitude);
}

TEST_F(KYNAXLocationTest, StateCodeFallsBackOnlyWhenTheKeyIsMissing) {
  EXPECT_EQ(decode(R"({"location":{"address":{"administrativeArea":"CA"}}})")->avixLocation->stateCode, "CA");
  EXPECT_FALSE(decode(R"({"location":{"address":{"stateCode":null,"administrativeArea":"CA"}}})")->avixLocation->stateCode);
  EXPECT_FALSE(decode(R"({"location":{"address":null}})")->avixLocation->stateCode);
  EXPECT_FALSE(decode(R"({"location":{"address":{"locality":null}}})")->avixLocation->city);
}

TEST_F(KYNAXLocationTest, TheFirstLabelThatIsThereWins) {
  EXPECT_EQ(decode(R"({"location":{"labels":[{},{"label":"Home"},{"label":"Work"}]}})")->avixLocation->label, "Home");
  EXPECT_EQ(decode(R"({"location":{"labels":[{"label":null},"x",7,{"label":9},{"label":"Gym"}]}})")->avixLocation->label,
            "Gym");
  EXPECT_FALSE(decode(R"({"location":{"labels":[]}})")->avixLocation->label);
  EXPECT_FALSE(decode(R"({"location":{"labels":null}})")->avixLocation->label);
  EXPECT_FALSE(decode(R"({"location":{"labels":{"label":"Home"}}})")->avixLocation->label);
}

TEST_F(KYNAXLocationTest, TimestampAtTheReferenceDateAndZeroCoordinates) {
  const auto record = decode(R"({"location":{"timestamp":978307200000,"latitude":0,"longitude":0}})");
  EXPECT_EQ(record->avixLocation->locationDate, 0.0);
  EXPECT_TRUE(record->hasCoordinate());
  EXPECT_FALSE(decode(R"({"location":{"latitude":10}})")->hasCoordinate());
}

TEST_F(KYNAXLocationTest, DistanceTextsAreReadInTheUsersLocaleAndNothingElseIsADistance) {
  EXPECT_FALSE(decode(R"({"distanceInMeters":"far away"})")->avixLocation->distance);
  EXPECT_FALSE(decode(R"({"distanceInMeters":1523.5})")->avixLocation->distance);
  EXPECT_FALSE(decode(R"({"distanceInMeters":null})")->avixLocation->distance);
  EXPECT_FALSE(decode(R"({"distanceInMeters":{"m":1}})")->avixLocation->distance);
  services().numberFormatting.set(std::make_shared<platform::IcuNumberFormatting>("de_DE"));
  EXPECT_EQ(decode(R"({"distanceInMeters":"1.523,5"})")->avixLocation->distance, 1523.5);
}

TEST_F(KYNAXLocationTest, ValuesOfTheWrongTypeReadAsAbsent) {
  const auto l = decode(R"({"location":{"latitude":"45.5","longitude":[1],"horizontalAccuracy":true,
    "timestamp":"1763740500000","streetAddress":12,"address":{"locality":5,"stateCode":{"x":1}}}})")->avixLocation;
  EXPECT_FALSE(l->latitude || l->longitude || l->accuracy || l->locationDate || l->street || l->city || l->stateCode);
}

TEST_F(KYNAXLocationTest, PlaceTexts) {
  auto place = [](const char* city, const char* state) {
    std::string json = R"({"location":{"address":{)";
    if (city) json += std::string(R"("locality":")") + city + "\"";
    if (city && state) json += ",";
    if (state) json += std::string(R"("stateCode":")") + state + "\"";
    json += "}}}";
    return decode(json.c_str())->friendLocation(true);
  };
  EXPECT_EQ(place("Paris", "Paris"), "Paris");
  EXPECT_EQ(place(nullptr, "NY"), "NY");
  EXPECT_EQ(place("Lyon", nullptr), "Lyon");
  EXPECT_EQ(place("Portland", "OR"), "Portland, OR");
  EXPECT_EQ(place("", "OR"), ", OR");  // an empty city counts as present
  EXPECT_EQ(decode(R"({"location":{"labels":[{"label":""}],"address":{"locality":"Lyon"}}})")->friendLocation(true), "");
  EXPECT_EQ(decode(R"({"location":{"labels":[{"label":"Home"}],"address":{"locality":"Lyon"}}})")->friendLocation(true),
            "Home");
  assistant->setLanguageCode("de");
  EXPECT_EQ(decode(R"({})")->friendLocation(false), "Wird gesucht …");
}

TEST_F(KYNAXLocationTest, WithoutAPersonTheContactsNameTheFriend) {
  auto& ada = addressBook->add("ada-1");
  ada.givenName = "Ada";
  ada.familyName = "Lovelace";
  ada.emailAddresses = {{"home", "ada@example.com"}};
  auto& grace = addressBook->add("grace-1");
  grace.formattedName = "Grace Hopper";
  grace.phoneNumbers = {{"mobile", "(503) 555-0102"}};

  const Value entry = Value::object();
  const auto byEmail = KYNAXLocation::locationWithHandle("ADA@example.com", nullptr, &entry);
  const auto& person = *byEmail->avixLocation->friend_->object;
  EXPECT_EQ(person.firstName, "Ada");
  EXPECT_EQ(person.lastName, "Lovelace");
  EXPECT_EQ(person.fullName, "Ada Lovelace");
  EXPECT_EQ(person.identifier, platform::assistantIdentifierForContactIdentifier("ada-1"));
  EXPECT_EQ(person.emails->at(0)->emailAddress, "ADA@example.com");
  EXPECT_FALSE(person.phones);
  EXPECT_EQ(byEmail->friendName(), "Ada Lovelace");

  const auto byPhone = KYNAXLocation::locationWithHandle("+15035550102", nullptr, &entry);
  const auto& hopper = *byPhone->avixLocation->friend_->object;
  EXPECT_EQ(hopper.fullName, "Grace Hopper");
  EXPECT_FALSE(hopper.firstName);  // the card has no name parts
  EXPECT_EQ(hopper.phones->at(0)->number, "+15035550102");

  const auto stranger = KYNAXLocation::locationWithHandle("+15035550199", nullptr, &entry);
  const auto& unknown = *stranger->avixLocation->friend_->object;
  EXPECT_FALSE(unknown.fullName || unknown.identifier || unknown.firstName);
  EXPECT_EQ(stranger->friendName(), "+1 503-555-0199");
}

TEST_F(KYNAXLocationTest, IdentityReadOuts) {
  const auto twoEmails = withFriend({"first@example.com", "second@example.com"}, {"+15035550101"});
  EXPECT_EQ(twoEmails->friendEmail(), "second@example.com");
  EXPECT_EQ(twoEmails->friendHandle(), "second@example.com");
  EXPECT_EQ(twoEmails->unformattedHandle(), "second@example.com");
  EXPECT_FALSE(twoEmails->isPhone());  // e-mail always wins

  const auto phoneOnly = withFriend({}, {"+1 (503) 555-0100", "+15035550101"}, "");
  EXPECT_TRUE(phoneOnly->isPhone());
  EXPECT_EQ(phoneOnly->friendPhone(), "+15035550101");
  EXPECT_EQ(phoneOnly->friendHandlePretty(), "+1 503-555-0101");
  EXPECT_EQ(phoneOnly->friendName(), "+1 503-555-0101");  // an empty full name gives way
  EXPECT_EQ(phoneOnly->unformattedHandle(), "+15035550101");

  const auto nobody = withFriend({}, {});
  EXPECT_FALSE(nobody->friendHandle() || nobody->friendHandlePretty() || nobody->unformattedHandle() ||
               nobody->friendName());
  EXPECT_FALSE(nobody->isPhone());
  EXPECT_EQ(withFriend({}, {}, "Ada Lovelace")->friendName(), "Ada Lovelace");
}

TEST_F(KYNAXLocationTest, PhoneFormatting) {
  const auto r = withFriend({}, {});
  EXPECT_EQ(r->unformatPhoneNumber("+1 (408) 555-0100"), "+14085550100");
  EXPECT_EQ(r->unformatPhoneNumber("tel: 555.0100 ext. 7"), "55501007");
  EXPECT_EQ(r->unformatPhoneNumber("\u0665\u0665\u0665-\u0660\u0661"), "\u0665\u0665\u0665\u0660\u0661");
  EXPECT_EQ(r->formatPhoneNumber("+442079460018"), "+44 20 7946 0018");
  EXPECT_EQ(r->formatPhoneNumber("(408) 555-0100"), "(408) 555-0100");  // no country: shown unchanged
  EXPECT_EQ(r->formatPhoneNumber("not a number"), "not a number");
}

TEST_F(KYNAXLocationTest, WrappingAnAssistantLocationDecodesNothing) {
  auto given = std::make_shared<AXKynLocation>();
  given->label = "Home";
  const auto record = KYNAXLocation::locationWithAvixLocation(given);
  EXPECT_EQ(record->avixLocation, given);
  EXPECT_EQ(record->friendLocation(true), "Home");
  EXPECT_FALSE(record->friendHandle());
  EXPECT_EQ(addressBook->queries, 0);
}

TEST_F(KYNAXLocationTest, DecodingAgainStartsFromANewLocation) {
  auto record = decode(R"({"location":{"latitude":1,"longitude":2}})");
  const auto first = record->avixLocation;
  const Value entry = Value::object();
  record->decodeHandle("b@example.com", std::make_shared<AXPerson>(), &entry);
  EXPECT_NE(record->avixLocation, first);
  EXPECT_FALSE(record->hasCoordinate());
  EXPECT_EQ(record->avixLocation->friend_->data, "b@example.com");
}

}  // namespace
}  // namespace kyn
