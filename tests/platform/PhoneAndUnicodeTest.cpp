#include "platform/phone/PhoneNumbers.h"
#include "platform/phone/ResultCache.h"
#include "platform/text/Unicode.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

namespace kyn::platform {
namespace {

TEST(PhoneNumbers, CanonicalFormIsOneTextPerNumber) {
  for (const char* written : {"(408) 555-0100", "408.555.0100", "+1 408 555 0100", "1-408-555-0100", "4085550100"}) {
    EXPECT_EQ(formatPhoneNumber(written, "us", PhoneNumberStyle::Canonical), "+14085550100") << written;
  }
  EXPECT_EQ(formatPhoneNumber("030 901820", "de", PhoneNumberStyle::Canonical), "+4930901820");
  EXPECT_EQ(formatPhoneNumber("01 99 00 12 34", "fr", PhoneNumberStyle::Canonical), "+33199001234");
  // A region no code is as long as: an international number still reads, its cache key too long for the stack.
  EXPECT_EQ(formatPhoneNumber("+1 408 555 0100", std::string(300, 'x'), PhoneNumberStyle::Canonical), "+14085550100");
}

TEST(PhoneNumbers, NumbersThatLeftTheCacheOfRecentResultsAreReadAfresh) {
  auto number = [](int i) { return "+1 503 555 " + std::to_string(10000 + i).substr(1); };
  for (int i = 0; i < 8200; ++i) (void)formatPhoneNumber(number(i), "", PhoneNumberStyle::Canonical);
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(formatPhoneNumber(number(i), "", PhoneNumberStyle::Canonical), "+1503555000" + std::to_string(i));
  }
}

TEST(PhoneNumbers, TheResultsCacheFindsWhatItHoldsThroughCollisionsAndEvictions) {
  // Keys hash to two neighbouring slots by their last digit, near the start or at the last slot and
  // the first (their run wraps round), so that what goes leaves gaps inside runs: each result kept
  // is found, with its own value, as results come and go.
  struct TwoSlots {
    std::size_t slot;
    std::size_t operator()(std::string_view key) const { return slot + static_cast<std::size_t>(key.back() % 2); }
  };
  for (const std::size_t slot : {5u, 63u}) {
    ResultCache<4, TwoSlots> cache(TwoSlots{slot});
    for (int i = 0; i < 12; ++i) {
      cache.insert(std::to_string(i), "r" + std::to_string(i));
      int held = 0;
      for (int k = 0; k <= i; ++k) {
        if (const auto found = cache.find(std::to_string(k))) {
          ++held;
          EXPECT_EQ(*found, "r" + std::to_string(k));
        }
      }
      EXPECT_EQ(held, std::min(i + 1, 4)) << slot << " " << i;
    }
  }
}

TEST(PhoneNumbers, TheRegionDecidesNumbersWithoutAnInternationalPrefix) {
  EXPECT_EQ(formatPhoneNumber("020 7946 0018", "gb", PhoneNumberStyle::Canonical), "+442079460018");
  EXPECT_NE(formatPhoneNumber("020 7946 0018", "us", PhoneNumberStyle::Canonical), "+442079460018");
  // Without a region only international numbers can be read.
  EXPECT_FALSE(formatPhoneNumber("(408) 555-0100", "", PhoneNumberStyle::Display));
  EXPECT_EQ(formatPhoneNumber("+14085550100", "", PhoneNumberStyle::Display), "+1 408-555-0100");
}

TEST(PhoneNumbers, TextsThatAreNoNumberGiveNothing) {
  const std::string texts[] = {"", "Ada", "BusinessPhone", "+", "\xFF\xFE", "--", "12", "11111111111111111",
                               std::string(300, '5')};  // the last three: lengths impossible for the country
  for (const auto& text : texts) EXPECT_FALSE(formatPhoneNumber(text, "us", PhoneNumberStyle::Canonical)) << text;
  EXPECT_FALSE(formatPhoneNumber("4085550100", "zz-not-a-region", PhoneNumberStyle::Canonical));
  EXPECT_EQ(formatPhoneNumber("555-0100", "us", PhoneNumberStyle::Canonical), "+15550100");  // no area code
}

TEST(Unicode, DecimalDigitsOfEveryScript) {
  for (char32_t c : {U'0', U'9', U'\u0664', U'\u0968', U'\uFF15', U'\U0001D7CE'}) EXPECT_TRUE(isDecimalDigit(c)) << static_cast<std::uint32_t>(c);
  for (char32_t c : {U'a', U'+', U'\u00B2', U'\u2164', U'\u4E09'}) EXPECT_FALSE(isDecimalDigit(c)) << static_cast<std::uint32_t>(c);  // ², Ⅴ, 三
}

TEST(Unicode, CuttingKeepsWholeCharacters) {
  auto digit = [](char32_t c) { return isDecimalDigit(c); };
  EXPECT_EQ(suffixFromFirstMatch("Tel: 555", digit), "555");
  EXPECT_FALSE(suffixFromFirstMatch("no digits", digit));
  EXPECT_EQ(suffixFromFirstMatch("", digit), std::nullopt);
  // A combining mark that the predicate accepts sits in the middle of a character: the cut moves
  // back to the character's start.
  auto acute = [](char32_t c) { return c == U'\u0301'; };
  EXPECT_EQ(suffixFromFirstMatch("xe\u0301y", acute), "e\u0301y");
  // An emoji keycap keeps its base digit, its selector and its keycap mark together.
  EXPECT_EQ(suffixFromFirstMatch("call 1\uFE0F\u20E3", digit), "1\uFE0F\u20E3");
  // CR LF is one character even though both are ASCII.
  EXPECT_EQ(suffixFromFirstMatch("a\r\nb", [](char32_t c) { return c == U'\n'; }), "\r\nb");
}

TEST(Unicode, KeepingCodePointsDropsIllFormedBytes) {
  auto keep = [](char32_t c) { return c == U'+' || isDecimalDigit(c); };
  EXPECT_EQ(keepCodePoints("+1 (408) 555-0100", keep), "+14085550100");
  EXPECT_EQ(keepCodePoints("\u0664\u0660 x", keep), "\u0664\u0660");
  EXPECT_EQ(keepCodePoints("1\xFF\xC3" "2", keep), "12");
}

TEST(PhoneNumbers, ACanonicalTextReadsBackAsItself) {
  // Invalid numbers on which the parser's first E.164 text is not stable.
  for (const char* text : {"+44 0 20 7946 0018", "+39 06 698 0000", "+49000 00 7y 44phrase6 "}) {
    const auto once = formatPhoneNumber(text, "us", PhoneNumberStyle::Canonical);
    ASSERT_TRUE(once) << text;
    EXPECT_EQ(formatPhoneNumber(*once, "us", PhoneNumberStyle::Canonical), once) << text;
  }
  // Italian numbers keep their leading zero: it belongs to the number.
  EXPECT_EQ(formatPhoneNumber("+39 06 698 0000", "us", PhoneNumberStyle::Canonical), "+39066980000");
}

}  // namespace
}  // namespace kyn::platform
