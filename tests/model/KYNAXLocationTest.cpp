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
  using Texts = std::vector<std::optional<std::string>>;
  static std::shared_ptr<KYNAXLocation> withFriend(Texts emails, Texts phones, std::optional<std::string> fullName = {}) {
    return KYNAXLocation::locationWithHandle("h", test::makePerson(std::move(emails), std::move(phones), std::move(fullName)),
                                             nullptr);
  }
};

// An entry decodes to these fields of the location (its dictionary without class and friend); each
// is read only from a value of its own type, and the friend is always there.
TEST_F(KYNAXLocationTest, EachFieldComesOnlyFromAValueOfItsType) {
  const std::pair<const char*, const char*> cases[] = {
      {R"({"distanceInMeters":"1,523.5","status":200,"match":true,
           "location":{"latitude":45.5152,"longitude":-122.6784,"horizontalAccuracy":65,"timestamp":1763740500000,
                       "streetAddress":"1 Example Way","labels":[{"label":"Work"}],
                       "address":{"locality":"Portland","stateCode":"OR","administrativeArea":"Oregon"}}})",
       R"({"distance":1523.5,"city":"Portland","stateCode":"OR","street":"1 Example Way","latitude":45.5152,
           "longitude":-122.6784,"accuracy":65.0,"locationDate":785433300.0,"label":"Work"})"},
      {R"({"location":null})", "{}"},
      {"{}", "{}"},
      {R"({"location":"somewhere"})", "{}"},
      {"null", "{}"},
      // The state falls back to the area only when its key is missing.
      {R"({"location":{"address":{"administrativeArea":"CA"}}})", R"({"stateCode":"CA"})"},
      {R"({"location":{"address":{"stateCode":null,"administrativeArea":"CA"}}})", "{}"},
      {R"({"location":{"address":null}})", "{}"},
      // The first label that is there wins.
      {R"({"location":{"labels":[{},{"label":"Home"},{"label":"Work"}]}})", R"({"label":"Home"})"},
      {R"({"location":{"labels":[{"label":null},"x",7,{"label":9},{"label":"Gym"}]}})", R"({"label":"Gym"})"},
      {R"({"location":{"labels":[]}})", "{}"},
      {R"({"location":{"labels":{"label":"Home"}}})", "{}"},
      // The reference date and zero coordinates are values.
      {R"({"location":{"timestamp":978307200000,"latitude":0,"longitude":0}})",
       R"({"latitude":0.0,"longitude":0.0,"locationDate":0.0})"},
      // A distance is a text in the user's locale, nothing else.
      {R"({"distanceInMeters":"far away"})", "{}"},
      {R"({"distanceInMeters":1523.5})", "{}"},
      {R"({"distanceInMeters":{"m":1}})", "{}"},
      {R"({"location":{"latitude":"45.5","longitude":[1],"horizontalAccuracy":true,"timestamp":"1763740500000",
           "streetAddress":12,"labels":null,"address":{"locality":5,"stateCode":{"x":1}}}})", "{}"},
  };
  for (const auto& [json, fields] : cases) {
    SCOPED_TRACE(json);
    const auto record = decode(json);
    ASSERT_TRUE(record->avixLocation->friend_);
    EXPECT_EQ(record->avixLocation->friend_->data, "ada@example.com");
    Value decoded = record->avixLocation->dictionary();
    decoded.erase("class");
    decoded.erase("friend");
    EXPECT_EQ(decoded, Value::parse(fields));
  }
  EXPECT_TRUE(decode(R"({"location":{"latitude":0,"longitude":0}})")->hasCoordinate());
  EXPECT_FALSE(decode(R"({"location":{"latitude":10}})")->hasCoordinate());
  const auto noEntry = KYNAXLocation::locationWithHandle("ada@example.com", std::make_shared<AXPerson>(), nullptr);
  EXPECT_TRUE(noEntry->avixLocation->friend_);
  EXPECT_FALSE(noEntry->avixLocation->latitude);
  EXPECT_EQ(noEntry->friendLocation(false), "Locating…");
  EXPECT_EQ(noEntry->friendLocation(true), "No location found");
  services().numberFormatting.set(std::make_shared<platform::IcuNumberFormatting>("de_DE"));
  EXPECT_EQ(decode(R"({"distanceInMeters":"1.523,5"})")->avixLocation->distance, 1523.5);
}

TEST_F(KYNAXLocationTest, PlaceTexts) {
  const std::pair<const char*, const char*> cases[] = {
      {R"("address":{"locality":"Paris","stateCode":"Paris"})", "Paris"},
      {R"("address":{"stateCode":"NY"})", "NY"},
      {R"("address":{"locality":"Lyon"})", "Lyon"},
      {R"("address":{"locality":"Portland","stateCode":"OR"})", "Portland, OR"},
      {R"("address":{"locality":"","stateCode":"OR"})", ", OR"},  // an empty city counts as present
      {R"("labels":[{"label":""}],"address":{"locality":"Lyon"})", ""},
      {R"("labels":[{"label":"Home"}],"address":{"locality":"Lyon"})", "Home"},
  };
  for (const auto& [location, text] : cases) {
    EXPECT_EQ(decode(("{\"location\":{" + std::string(location) + "}}").c_str())->friendLocation(true), text) << location;
  }
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
  EXPECT_EQ(std::tie(person.firstName, person.lastName, person.fullName), std::tuple("Ada", "Lovelace", "Ada Lovelace"));
  EXPECT_EQ(person.identifier, platform::assistantIdentifierForContactIdentifier("ada-1"));
  EXPECT_EQ(person.emails->at(0)->emailAddress, "ADA@example.com");
  EXPECT_FALSE(person.phones);
  EXPECT_EQ(byEmail->friendName(), "Ada Lovelace");

  const auto byPhone = KYNAXLocation::locationWithHandle("+15035550102", nullptr, &entry);
  const auto& hopper = *byPhone->avixLocation->friend_->object;
  EXPECT_EQ(std::tie(hopper.fullName, hopper.firstName), std::tuple("Grace Hopper", std::nullopt));  // no name parts
  EXPECT_EQ(hopper.phones->at(0)->number, "+15035550102");

  const auto stranger = KYNAXLocation::locationWithHandle("+15035550199", nullptr, &entry);
  const auto& unknown = *stranger->avixLocation->friend_->object;
  EXPECT_FALSE(unknown.fullName || unknown.identifier || unknown.firstName);
  EXPECT_EQ(stranger->friendName(), "+1 503-555-0199");
}

TEST_F(KYNAXLocationTest, IdentityReadOuts) {
  const auto twoEmails = withFriend({"first@example.com", "second@example.com"}, {"+15035550101"});
  EXPECT_EQ(twoEmails->friendEmail(), "second@example.com");
  EXPECT_EQ(twoEmails->friendHandlePretty(), "second@example.com");  // e-mail always wins

  const auto phoneOnly = withFriend({}, {"+1 (503) 555-0100", "+15035550101"}, "");
  EXPECT_EQ(phoneOnly->friendPhone(), "+15035550101");
  EXPECT_EQ(phoneOnly->friendHandlePretty(), "+1 503-555-0101");
  EXPECT_EQ(phoneOnly->friendName(), "+1 503-555-0101");  // an empty full name gives way

  const auto nobody = withFriend({}, {});
  EXPECT_FALSE(nobody->friendHandlePretty() || nobody->friendName());
  EXPECT_EQ(withFriend({}, {}, "Ada Lovelace")->friendName(), "Ada Lovelace");
  EXPECT_EQ(withFriend({}, {"(408) 555-0100"})->friendHandlePretty(), "(408) 555-0100");  // no country: unchanged
}

TEST_F(KYNAXLocationTest, WrappingAnAssistantLocationDecodesNothing) {
  auto given = std::make_shared<AXKynLocation>();
  const auto record = KYNAXLocation::locationWithAvixLocation(given);
  EXPECT_EQ(record->avixLocation, given);
  EXPECT_FALSE(record->friendHandle());
  EXPECT_EQ(addressBook->queries, 0);
}

}  // namespace
}  // namespace kyn
