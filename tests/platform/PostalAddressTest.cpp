#include "platform/Services.h"
#include "support/PlatformTest.h"
#include "platform/locale/IcuLocaleInfo.h"

#include <nlohmann/json.hpp>

#include <gtest/gtest.h>

namespace kyn::platform {
namespace {

using PostalAddressTest = test::PlatformTest;

struct Case {
  const char* what;
  PostalAddress address;
  const char* systemLocale;
  const char* language;
  const char* expected;
};

// The registry's formatter throughout: region and language are swapped between cases and must be
// read on every call.
TEST_F(PostalAddressTest, MailingAddressesByTheConventionsOfTheirCountry) {
  const Case cases[] = {
      {"US: city and state in capitals", {"1500 Harbor Road", "Portland", "OR", "97201", "US"}, "en_US", "en-US",
       "1500 Harbor Road\nPORTLAND, OR 97201"},
      {"GB: no state line, foreign country named", {"10 Downing Street", "London", "England", "SW1A 2AA", "GB"},
       "en_US", "en-US", "10 Downing Street\nLONDON\nSW1A 2AA\nUnited Kingdom"},
      {"DE: lower-case code, postal code first", {"Unter den Linden 1", "Berlin", "BE", "10117", "de"}, "de_DE",
       "de-DE", "Unter den Linden 1\n10117 Berlin"},
      {"FR: country named in the assistant's language", {"8 Rue de Rivoli", "Paris", {}, "75004", "FR"}, "de_DE",
       "de-DE", "8 Rue de Rivoli\n75004 PARIS\nFrankreich"},
      {"JP: own script, own order", {"千代田1-1", "千代田区", "東京都", "100-0001", "JP"}, "ja_JP", "ja-JP",
       "〒100-0001\n東京都千代田区\n千代田1-1"},
      {"JP: Latin-script layout", {"1-1 Chiyoda", "Chiyoda-ku", "Tokyo", "100-0001", "JP"}, "en_US", "fr-FR",
       "1-1 Chiyoda\nChiyoda-ku, TOKYO\n100-0001\nJapon"},
      {"missing state: no stray separator", {"1500 Harbor Road", "Portland", {}, "97201", "US"}, "en_US", "en-US",
       "1500 Harbor Road\nPORTLAND 97201"},
      {"missing first field: no prefix, blank street", {" \t", "Zürich", {}, "", "CH"}, "de_CH", "de-CH", "Zürich"},
      {"street lines and whitespace", {"  221B  Baker Street \r\n\r\n Flat 1", "London", {}, "NW1 6XE", "GB"}, "en_GB",
       "en-GB", "221B Baker Street\nFlat 1\nLONDON\nNW1 6XE"},
      {"no country: the system's region decides", {"Hauptstr. 5", "Köln", "NW", "50667", {}}, "de_DE", "de-DE",
       "Hauptstr. 5\n50667 Köln"},
      {"no country, another region", {"Hauptstr. 5", "Köln", "NW", "50667", {}}, "en_US", "en-US",
       "Hauptstr. 5\nKÖLN, NW 50667"},
      {"only a country", {{}, {}, {}, {}, "CA"}, "en_US", "en-US", "Canada"},
      {"a country that is no code: default layout, kept as written",
       {"Hauptstr. 5", "Köln", {}, "50667", "Deutschland"}, "en_US", "en-US", "Hauptstr. 5\nKöln\n50667\nDeutschland"},
      {"empty address", {}, "en_US", "en-US", ""},
  };
  auto& s = services();
  const auto formatter = s.postalAddressFormatter.get();
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    s.locale.set(std::make_shared<IcuLocaleInfo>(c.systemLocale));
    assistant->setLanguageCode(c.language);
    EXPECT_EQ(formatter->stringFromPostalAddress(c.address), c.expected);
  }
}

TEST_F(PostalAddressTest, AnyInputGivesValidText) {
  PostalAddress address{std::string(1 << 20, 'a'), "Par\xFF\xC3is", "\xE2\x82", std::string("75\0" "004", 6), "F\xC0"};
  const auto formatter = services().postalAddressFormatter.get();
  const auto text = formatter->stringFromPostalAddress(address);
  EXPECT_EQ(std::ranges::count(text, 'a'), 64 * 1024 + 1);  // the street cut at 64 KiB, and "Par"
  EXPECT_NE(text.find("Par\uFFFD\uFFFDis"), std::string::npos);
  EXPECT_NE(text.find("75 004"), std::string::npos);  // a control character is a space
  EXPECT_NO_THROW((void)nlohmann::json(text).dump());  // the request body serialises it
  address.street = std::string(1 << 17, '\x80');  // no character starts before the cut: no street line
  EXPECT_EQ(formatter->stringFromPostalAddress(address), text.substr(64 * 1024 + 1));
  address.country = "d1";  // two characters, yet no code: kept as written
  EXPECT_TRUE(formatter->stringFromPostalAddress(address).ends_with("\nd1"));
}

}  // namespace
}  // namespace kyn::platform
