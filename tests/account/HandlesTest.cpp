#include "account/Common.h"
#include "platform/locale/IcuLocaleInfo.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using platform::services;

class HandlesTest : public test::PlatformTest {
 protected:
  Common common;
};

TEST_F(HandlesTest, OnlyLeadingJunkIsCutBeforeParsing) {
  const std::pair<std::optional<std::string>, std::optional<std::string>> cases[] = {
      {"Mobile: +1 (408) 555-0100", "+14085550100"},
      {"(408) 555-0100", "+14085550100"},
      {"ext. 12", "12"},              // cut, and too short to be a number
      {"ext. x", "ext. x"},           // nothing to cut, no number
      {"Ada Lovelace", "Ada Lovelace"},
      {"tel \u0664\u0660\u0668\u0665\u0665\u0665\u0660\u0661\u0660\u0660", "+14085550100"},
      {"", ""},
      {std::nullopt, std::nullopt},
  };
  for (const auto& [raw, completed] : cases) EXPECT_EQ(common.completeNumberForPhoneNumber(raw), completed) << raw.value_or("(none)");
  // Each phone character ends the junk: what stands before it goes, the character stays.
  for (const char* first : {"+", "(", ")", "*", "#", "-"}) {
    EXPECT_EQ(common.completeNumberForPhoneNumber(std::string("abc ") + first + "x"), std::string(first) + "x") << first;
  }
}

TEST_F(HandlesTest, TheLocalesCountryReadsNationalNumbers) {
  services().locale.set(std::make_shared<platform::IcuLocaleInfo>("en_GB"));
  EXPECT_EQ(Common::defaultCountryCode(), "gb");
  EXPECT_EQ(common.completeNumberForPhoneNumber("020 7946 0018"), "+442079460018");
  services().locale.set(std::make_shared<platform::IcuLocaleInfo>("fr"));  // no country
  EXPECT_EQ(Common::defaultCountryCode(), "us");
}

TEST_F(HandlesTest, PhonesFirstThenEmailsWithDuplicatesKept) {
  const auto p = test::makePerson({"ada@example.com", std::nullopt}, {"(503) 555-0101", "503.555.0101"});
  EXPECT_EQ(common.handlesForAXPerson(*p),
            (std::vector<std::string>{"+15035550101", "+15035550101", "ada@example.com"}));
  EXPECT_TRUE(common.handlesForAXPerson(AXPerson{}).empty());
  EXPECT_TRUE(common.isHandleEmail("@@not really"));
  EXPECT_FALSE(common.isHandleEmail("+14085550100"));
}

TEST_F(HandlesTest, WithoutPhonesOfItsOwnThePersonsContactLendsItsNumbers) {
  auto& contact = addressBook->add("ada-1");
  contact.phoneNumbers = {{"mobile", "(503) 555-0101"}, {"work", "+44 20 7946 0018"}};
  auto p = test::makePerson({"Ada@Example.com"}, {});
  p->identifier = platform::assistantIdentifierForContactIdentifier("ada-1");
  std::vector<std::string> handles{"+15035550100"};  // an earlier friend's handle is not its own
  common.appendHandlesForAXPerson(*p, handles);
  EXPECT_EQ(handles, (std::vector<std::string>{"+15035550100", "+15035550101", "+442079460018", "Ada@Example.com"}));
  // A phone entry without a number brings nothing, so the contact still lends its numbers.
  auto q = test::makePerson({}, {std::nullopt});
  q->identifier = p->identifier;
  EXPECT_EQ(common.handlesForAXPerson(*q).size(), 2u);
  // A person with a number of its own never gets the contact's.
  auto r = test::makePerson({}, {"+1 503 555 0199"});
  r->identifier = p->identifier;
  EXPECT_EQ(common.handlesForAXPerson(*r), (std::vector<std::string>{"+15035550199"}));
}

}  // namespace
}  // namespace kyn
