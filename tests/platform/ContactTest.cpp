#include "platform/contacts/Contact.h"
#include "platform/image/Image.h"
#include "support/FakeContactStore.h"

#include <gtest/gtest.h>

namespace kyn::platform {
namespace {

Contact sample() {
  Contact c;
  c.namePrefix = "Dr.";
  c.givenName = "Ada";
  c.middleName = "King";
  c.familyName = "Lovelace";
  c.nameSuffix = "Jr.";
  c.organizationName = "Analytical Works";
  c.note = "private";
  return c;
}

TEST(ContactProjection, TheFullNameDescriptorBringsEveryNamePartAndAWholeContactIsShared) {
  // A key that names nothing is passed over, also where no one asks to hear of it.
  const Contact named = projectContact(sample(), {std::string(ContactKey::FullNameFormatterKeys), "noSuchKey"});
  EXPECT_EQ(fullNameOfContact(named, "en_US"), fullNameOfContact(sample(), "en_US"));
  EXPECT_FALSE(named.note);
  // A contact that holds nothing the keys drop is shared as it is; one that does is copied without it.
  const ContactProjection projection({std::string(ContactKey::FullNameFormatterKeys), "note", "imageData",
                                      "phoneNumbers", "emailAddresses"});
  const auto whole = std::make_shared<const Contact>(sample());
  EXPECT_EQ(projection.share(whole), whole);
  Contact born = sample();
  born.birthday = "1815-12-10";
  const auto copied = projection.share(std::make_shared<const Contact>(born));
  EXPECT_FALSE(copied->birthday);
  EXPECT_EQ(copied->note, "private");
  Contact organization;  // nothing else that the note-only list drops
  organization.contactType = ContactType::Organization;
  EXPECT_EQ(ContactProjection({"note"}).share(std::make_shared<const Contact>(organization))->contactType, ContactType::Person);
}

TEST(ContactFullName, TheCardsOwnNameWins) {
  Contact c = sample();
  c.formattedName = "Countess Ada";
  EXPECT_EQ(fullNameOfContact(c, "en_US"), "Countess Ada");
  c.formattedName = "";
  EXPECT_EQ(fullNameOfContact(c, "en_US"), "Dr. Ada King Lovelace Jr.");
  // Any one name part makes a person's name; the organisation stands in only without one.
  c.givenName.reset();
  c.middleName.reset();
  EXPECT_EQ(fullNameOfContact(c, "en_US"), "Dr. Lovelace Jr.");
  c.familyName.reset();
  c.middleName = "King";
  EXPECT_EQ(fullNameOfContact(c, "en_US"), "Dr. King Jr.");
}

TEST(ContactFullName, PartsInTheLocalesOrder) {
  Contact c;
  c.givenName = "Taro";
  c.familyName = "Yamada";
  EXPECT_EQ(fullNameOfContact(c, "en_GB"), "Taro Yamada");
  EXPECT_EQ(fullNameOfContact(c, "ja_JP"), "YamadaTaro");
  EXPECT_EQ(fullNameOfContact(c, "hu"), "Yamada Taro");
  EXPECT_EQ(fullNameOfContact(c, "de_DE"), "Taro Yamada");
}

TEST(ContactFullName, OrganisationsAndNamelessContacts) {
  Contact org;
  org.contactType = ContactType::Organization;
  org.givenName = "Front";
  org.organizationName = "Example Bakery";
  EXPECT_EQ(fullNameOfContact(org, "en_US"), "Example Bakery");
  Contact onlyOrg;
  onlyOrg.organizationName = "Example Bakery";
  EXPECT_EQ(fullNameOfContact(onlyOrg, "en_US"), "Example Bakery");
  Contact nothing;
  nothing.emailAddresses = {{std::nullopt, "x@example.com"}};
  nothing.nickname = "X";
  EXPECT_FALSE(fullNameOfContact(nothing, "en_US"));
}

TEST(AssistantIdentifier, MapsBothWaysForAnyIdentifier) {
  for (const char* id : {"card-1", "urn:uuid:4fbe8971-0bc3-424c-9c26-36c3e1eff6b1", "a/b?c=d&e#f", "Zoë 東京",
                         "contacts.vcf#3"}) {
    const std::string url = assistantIdentifierForContactIdentifier(id);
    EXPECT_TRUE(url.starts_with("x-kyn-contact:"));
    EXPECT_EQ(url.find_first_of(" ?#&/"), std::string::npos) << url;
    EXPECT_EQ(contactIdentifierForAssistantIdentifier(url), id);
  }
  for (const char* foreign : {"", "x-kyn-contact:", "x-kyn-contact:%zz", "https://example.com/a", "card-1"}) {
    EXPECT_FALSE(contactIdentifierForAssistantIdentifier(foreign)) << foreign;
  }
}

TEST(ImageDecoding, DecodesPicturesAndRefusesTheRest) {
  const auto picture = decodeImage(*test::tinyPicture());
  ASSERT_TRUE(picture);
  EXPECT_EQ(picture->width, 2);
  EXPECT_EQ(picture->height, 1);
  EXPECT_EQ(picture->channels, 1);
  EXPECT_EQ(picture->pixels, (std::vector<std::uint8_t>{0x10, 0xF0}));
  const auto bytes = test::tinyPicture();  // a contact's picture: its size and its bytes, no second copy as pixels
  const auto held = imageFromData(bytes);
  EXPECT_TRUE(held && held->width == 2 && held->encoded == bytes && held->pixels.empty());

  // Nothing, junk, a header that promises 40000 x 40000 pixels (refused before anything is allocated)
  // and a header that ends before the size.
  for (const std::string_view bad : {"", "definitely not a picture", "P5\n40000 40000\n255\n\x01", "P5\n20"}) {
    EXPECT_FALSE(decodeImage(std::span(reinterpret_cast<const std::uint8_t*>(bad.data()), bad.size()))) << bad;
  }
}

}  // namespace
}  // namespace kyn::platform
