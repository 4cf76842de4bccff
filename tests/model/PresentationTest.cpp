#include "model/KYNAXLocation.h"
#include "support/PlatformTest.h"
#include "utils/KYNAXUtils.h"

namespace kyn {
namespace {

using platform::services;

class PresentationTest : public test::PlatformTest {
 protected:
  static std::shared_ptr<KYNAXLocation> fixedAt(std::optional<double> date) {
    auto location = std::make_shared<AXKynLocation>();
    location->locationDate = date;
    return KYNAXLocation::locationWithAvixLocation(location);
  }
};

// The clock stands at 2026-11-21 15:30 UTC in a UTC calendar; the formats are en_US's.
TEST_F(PresentationTest, TimestampsAroundTheTwoMidnights) {
  const double today = test::utcDate(2026, 11, 21);
  ASSERT_EQ(KYNAXUtils::todayAtMidnight(), today);
  const struct {
    std::optional<double> date;
    std::optional<std::string> text;
  } cases[] = {
      {std::nullopt, std::nullopt},
      {0.0, std::nullopt},
      {today + 1, "12:00\u202FAM"},
      {today, "Yesterday"},  // exactly midnight is already yesterday
      {today - 86'400 + 1, "Yesterday"},
      {today - 86'400, "11/20/26, 12:00\u202FAM"},  // exactly yesterday's midnight is a date
      {today - 40 * 86'400 + 3'600, "10/12/26, 1:00\u202FAM"},
  };
  for (const auto& c : cases) EXPECT_EQ(fixedAt(c.date)->prettyTimestamp(), c.text) << c.date.value_or(-1);

  assistant->setLanguageCode("de");
  EXPECT_EQ(fixedAt(today - 1)->prettyTimestamp(), "Gestern");
}

TEST_F(PresentationTest, ADistanceNeedsBothPlacesAndIsLogged) {
  const auto here = std::make_shared<platform::Location>(test::fix(45.5231, -122.6765));
  auto location = std::make_shared<AXKynLocation>();
  const auto record = KYNAXLocation::locationWithAvixLocation(location);
  location->friend_ = std::make_shared<AXPersonAttribute>();
  location->friend_->object = test::makePerson({"ada@example.com"}, {}, "Ada Lovelace");

  EXPECT_FALSE(record->distanceFromLocation(here));  // the friend has no coordinate
  location->latitude = 45.5152;
  location->longitude = -122.6784;
  EXPECT_FALSE(record->distanceFromLocation(nullptr));
  EXPECT_FALSE(log->contains("Distance calculated"));

  const auto text = record->distanceFromLocation(here);
  ASSERT_TRUE(text);
  const auto calculator = KYNAXLocation::distanceCalculator();
  EXPECT_EQ(text, calculator->localizedDistanceFromLocation(*here, test::fix(45.5152, -122.6784)));
  EXPECT_TRUE(log->contains("Distance calculated: " + *text + " for friend: Ada Lovelace (Unit:" +
                            std::to_string(calculator->measurementSystem()) + ")"));
  EXPECT_EQ(KYNAXLocation::distanceCalculator(), calculator);  // one for the process
}

TEST_F(PresentationTest, PicturesComeFromTheFirstContactWithAFullPicture) {
  const auto emailPicture = test::tinyPicture(), phonePicture = test::tinyPicture(), idPicture = test::tinyPicture();
  addressBook->add("a").emailAddresses = {{"home", "first@example.com"}};
  auto& thumbnailOnly = addressBook->add("b");
  thumbnailOnly.emailAddresses = {{"home", "second@example.com"}};
  thumbnailOnly.thumbnailImageData = test::tinyPicture();
  auto& byEmail = addressBook->add("c");
  byEmail.emailAddresses = {{"home", "third@example.com"}};
  byEmail.imageData = emailPicture;
  auto& byPhone = addressBook->add("d");
  byPhone.phoneNumbers = {{"mobile", "(503) 555-0102"}};
  byPhone.imageData = phonePicture;
  addressBook->add("e").imageData = idPicture;

  auto encodedOf = [](const std::shared_ptr<const platform::Image>& image) {
    return image ? image->encoded : nullptr;
  };
  // E-mail contacts come before phone contacts, in order; a thumbnail is no picture.
  const auto person = test::makePerson({"first@example.com", "second@example.com", "third@example.com"},
                                       {"+15035550102"});
  EXPECT_EQ(encodedOf(KYNAXLocation::friendImageForAXPerson(person)), emailPicture);
  EXPECT_EQ(encodedOf(KYNAXLocation::friendImageForAXPerson(test::makePerson({"second@example.com"}, {"+15035550102"}))),
            phonePicture);
  EXPECT_FALSE(KYNAXLocation::friendImageForAXPerson(test::makePerson({"first@example.com"}, {})));
  EXPECT_FALSE(KYNAXLocation::friendImageForAXPerson(std::make_shared<AXEmail>()));  // not a person

  // The contact behind the person's identifier wins; without a picture there the handles decide.
  auto attribute = std::make_shared<AXPersonAttribute>();
  attribute->object = person;
  person->identifier = platform::assistantIdentifierForContactIdentifier("e");
  EXPECT_EQ(encodedOf(KYNAXLocation::friendImageForPersonAttribute(attribute)), idPicture);
  person->identifier = platform::assistantIdentifierForContactIdentifier("a");
  EXPECT_EQ(encodedOf(KYNAXLocation::friendImageForPersonAttribute(attribute)), emailPicture);

  // A picture found is kept; a friend without one is looked up again.
  auto location = std::make_shared<AXKynLocation>();
  location->friend_ = attribute;
  const auto record = KYNAXLocation::locationWithAvixLocation(location);
  ASSERT_TRUE(record->friendImage());
  const int queries = addressBook->queries;
  EXPECT_EQ(record->friendImage(), record->cachedFriendImage);
  EXPECT_EQ(addressBook->queries, queries);
  attribute->object = test::makePerson({"first@example.com"}, {});
  const auto without = KYNAXLocation::locationWithAvixLocation(location);
  EXPECT_FALSE(without->friendImage());
  EXPECT_FALSE(without->friendImage());
  EXPECT_GT(addressBook->queries, queries + 1);
}

}  // namespace
}  // namespace kyn
