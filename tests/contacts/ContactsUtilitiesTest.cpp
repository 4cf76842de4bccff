#include "contacts/ContactsUtilities.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using ContactRef = ContactsUtilities::ContactRef;

using ContactsUtilitiesTest = test::PlatformTest;

ContactRef contactWith(std::string id, bool picture, bool thumbnail = false) {
  auto c = std::make_shared<platform::Contact>();
  c->identifier = std::move(id);
  if (picture) c->imageData = test::tinyPicture();
  if (thumbnail) c->thumbnailImageData = test::tinyPicture();
  return c;
}

TEST(OptimalContact, PrefersTheFirstWithAFullPicture) {
  using V = std::vector<ContactRef>;
  const std::pair<V, const char*> cases[] = {
      {{contactWith("a", false), contactWith("b", false, true), contactWith("c", true), contactWith("d", true)}, "c"},
      {{contactWith("a", false), contactWith("b", false, true), contactWith("c", false)}, "a"},  // none has one
      {{contactWith("a", false), contactWith("b", true)}, "b"},
      {{contactWith("a", false)}, "a"}};
  for (const auto& [contacts, id] : cases) {
    EXPECT_EQ(ContactsUtilities::findOptimalContactInContacts(&contacts)->identifier, id) << contacts.size();
  }
  const V empty;
  EXPECT_FALSE(ContactsUtilities::findOptimalContactInContacts(&empty));
  EXPECT_FALSE(ContactsUtilities::findOptimalContactInContacts(nullptr));
}

TEST_F(ContactsUtilitiesTest, EmptyOrAbsentTextsNeverReachTheStore) {
  EXPECT_FALSE(ContactsUtilities::contactForEmail("") || ContactsUtilities::contactForEmail(std::nullopt));
  EXPECT_FALSE(ContactsUtilities::contactForPhone("") || ContactsUtilities::contactForPhone(std::nullopt));
  EXPECT_FALSE(ContactsUtilities::contactForAssistantId(std::nullopt) ||
               ContactsUtilities::contactForAssistantId("https://example.com/not-ours"));
  EXPECT_EQ(addressBook->queries, 0);
}

TEST_F(ContactsUtilitiesTest, FindsByEmailPhoneAndAssistantIdentifierFetchingTheKeyList) {
  auto& ada = addressBook->add("ada-1");
  ada.givenName = "Ada";
  ada.emailAddresses = {{"home", "Ada@Example.com"}};
  ada.phoneNumbers = {{"mobile", "(503) 555-0101"}};
  EXPECT_EQ(ContactsUtilities::contactForEmail("ada@example.com")->givenName, "Ada");
  EXPECT_EQ(ContactsUtilities::contactForPhone("+15035550101")->identifier, "ada-1");
  EXPECT_EQ(ContactsUtilities::contactForAssistantId(platform::assistantIdentifierForContactIdentifier("ada-1"))
                ->identifier,
            "ada-1");
  EXPECT_FALSE(ContactsUtilities::contactForAssistantId(platform::assistantIdentifierForContactIdentifier("nobody")));
  EXPECT_EQ(addressBook->lastKeys, ContactsUtilities::contactKeys());
  EXPECT_FALSE(ContactsUtilities::contactForEmail("grace@example.com"));
}

TEST_F(ContactsUtilitiesTest, OfSeveralMatchesTheOneWithAPictureIsChosen) {
  addressBook->add("first").emailAddresses = {{std::nullopt, "shared@example.com"}};
  auto& second = addressBook->add("second");
  second.emailAddresses = {{std::nullopt, "shared@example.com"}};
  second.thumbnailImageData = test::tinyPicture();  // a thumbnail is no picture
  auto& third = addressBook->add("third");
  third.emailAddresses = {{std::nullopt, "shared@example.com"}};
  third.imageData = test::tinyPicture();
  EXPECT_EQ(ContactsUtilities::contactForEmail("shared@example.com")->identifier, "third");
}

TEST(ContactKeys, EveryKeyNamesAPropertyTheStoreKnows) {
  std::string unknown;
  (void)platform::projectContact(platform::Contact{}, ContactsUtilities::contactKeys(), &unknown);
  EXPECT_EQ(unknown, "");
}

TEST(ContactImages, OnlyAFullPictureThatDecodesCounts) {
  EXPECT_FALSE(ContactsUtilities::imageForContact(nullptr));
  EXPECT_FALSE(ContactsUtilities::imageForContact(contactWith("t", false, true)));
  EXPECT_EQ(ContactsUtilities::imageForContact(contactWith("p", true))->width, 2);
  auto broken = std::make_shared<platform::Contact>();
  broken->imageData = std::make_shared<const std::vector<std::uint8_t>>(std::vector<std::uint8_t>{1, 2, 3});
  EXPECT_FALSE(ContactsUtilities::imageForContact(broken));
}

}  // namespace
}  // namespace kyn
