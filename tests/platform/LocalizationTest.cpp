#include "platform/assistant/AssistantPreferences.h"
#include "platform/localization/Localization.h"
#include "platform/log/Format.h"
#include "platform/localization/IcuLocalization.h"

#include <gtest/gtest.h>
#include <unicode/locid.h>

#include <cstdlib>
#include <string>

namespace kyn::platform {
namespace {

const char* const kKeys[] = {
    "LOCATED_NOW", "ACCESSIBILITY_LOCATED_NOW", "LOCATED_LESS_THAN_30SECONDS",
    "ACCESSIBILITY_LOCATED_LESS_THAN_30SECONDS", "LOCATED_MINUTES", "ACCESSIBILITY_LOCATED_MINUTE",
    "ACCESSIBILITY_LOCATED_MINUTES", "LOCATED_LESS_THAN_1HR", "ACCESSIBILITY_LOCATED_LESS_THAN_1HR",
    "LOCATED_MORE_THAN_1HR", "ACCESSIBILITY_LOCATED_MORE_THAN_1HR", "CITY_STATE_LABEL", "LOCATING",
    "NO_LOCATION", "DATE_YESTERDAY", "HIDDEN_LOCATION", "DISTANCE_AWAY"};

TEST(Localization, EveryLanguageHasEveryKeyWithItsPlaceholders) {
  IcuLocalization strings;
  for (const char* language : {"en", "de", "fr"}) {
    for (std::string_view key : kKeys) {
      const std::string text = strings.localizedString(key, language);
      EXPECT_NE(text, key) << language << " " << key;
      const bool isNow = key == "LOCATED_NOW" || key == "ACCESSIBILITY_LOCATED_NOW";
      const bool isAge = key.find("LOCATED") != std::string_view::npos;
      if (isAge || key == "DISTANCE_AWAY") {
        EXPECT_EQ(text.find("%@") != std::string::npos, !isNow) << language << " " << key << ": " << text;
      }
    }
    // City first, state second, whatever the language.
    EXPECT_EQ(format(strings.localizedString("CITY_STATE_LABEL", language), "Portland", "OR"), "Portland, OR");
  }
}

TEST(Localization, LanguagesFallBackToTheirParentsThenToEnglish) {
  IcuLocalization strings;
  for (const auto& [language, text] : {std::pair{"en-US", "Yesterday"}, {"de", "Gestern"}, {"de-CH", "Gestern"},
                                       {"de_AT", "Gestern"}, {"fr-CA", "Hier"}, {"ja-JP", "Yesterday"}, {"", "Yesterday"},
                                       {"!!not a tag", "Yesterday"}}) {
    EXPECT_EQ(strings.localizedString("DATE_YESTERDAY", language), text) << language;
  }
  EXPECT_EQ(strings.localizedString("NO_SUCH_KEY", "de"), "NO_SUCH_KEY");  // a missing key comes back as itself
  EXPECT_EQ(strings.localizedString("", "en"), "");
}

TEST(NumberFormatting, IntegersArePlainInTheLocale) {
  EXPECT_EQ(IcuNumberFormatting("en_US").integerText(12345), "12345");
  EXPECT_EQ(IcuNumberFormatting("de_DE").integerText(12345), "12345");
  EXPECT_EQ(IcuNumberFormatting("ar_EG").integerText(42), "\u0664\u0662");  // Arabic-Indic digits
}

TEST(NumberFormatting, DecimalsAreReadAsTheLocaleWritesThem) {
  IcuNumberFormatting en("en_US");
  IcuNumberFormatting de("de_DE");
  EXPECT_EQ(en.parseDecimal("1234.5"), 1234.5);
  // Up to fifteen digits are read without ICU: with the point at every place, they round as strtod
  // rounds them.
  for (const std::string digits : {"123456789012345", "000000000098765", "999999999999999"}) {
    for (std::size_t at = 1; at < digits.size(); ++at) {
      const std::string text = digits.substr(0, at) + "." + digits.substr(at);
      EXPECT_EQ(en.parseDecimal(text), std::strtod(text.c_str(), nullptr)) << text;
    }
  }
  EXPECT_EQ(en.parseDecimal("12345678901234567890"), 12345678901234567890.0);  // too long for the fast path
  EXPECT_EQ(en.parseDecimal("1,234.5"), 1234.5);
  EXPECT_EQ(de.parseDecimal("1234,5"), 1234.5);
  EXPECT_EQ(de.parseDecimal("1.234,5"), 1234.5);
  EXPECT_EQ(en.parseDecimal("-12"), -12.0);
  EXPECT_FALSE(IcuNumberFormatting("ar_EG").parseDecimal("1k5"));  // its separator U+066B is no "k"
  for (const char* bad : {"", "abc", "12abc", "1 2"}) EXPECT_FALSE(en.parseDecimal(bad)) << bad;
}

TEST(LanguageTags, BecomeIcuLocaleIds) {
  EXPECT_EQ(icuLocaleId("en-US"), "en_US");
  EXPECT_EQ(icuLocaleId("de_CH"), "de_CH");
  EXPECT_EQ(icuLocaleId("zh-Hant-TW"), "zh_Hant_TW");
  EXPECT_EQ(icuLocaleId(""), "root");
}

TEST(Localization, TheSystemLanguageIsTheDefaultLocaleUnlessThatIsThePosixOne) {
  const icu::Locale before = icu::Locale::getDefault();
  const std::pair<const char*, std::optional<std::string>> cases[] = {
      {"de_CH", "de-CH"}, {"fr", "fr"}, {"en_US_POSIX", std::nullopt}, {"c", std::nullopt}, {"", std::nullopt},
      {"de_DE_EURO", "de-DE-x-lvariant-euro"}};  // from the system's "de_DE@euro"
  for (const auto& [id, tag] : cases) {
    UErrorCode status = U_ZERO_ERROR;
    icu::Locale::setDefault(icu::Locale(id), status);
    EXPECT_EQ(systemLanguageTag(), tag) << id;
  }
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(before, status);
}

}  // namespace
}  // namespace kyn::platform
