#include "platform/text/SameText.h"
#include "platform/text/StringEscapes.h"

#include <gtest/gtest.h>

#include <random>

namespace kyn::platform {
namespace {

TEST(SameText, FindsADifferenceAtEveryPlaceOfEveryShortLength) {
  for (std::size_t n = 0; n <= 20; ++n) {
    const std::string a(n, 'k');
    EXPECT_TRUE(sameText(a, std::string(n, 'k')));
    EXPECT_FALSE(sameText(a, std::string(n + 1, 'k')));
    for (std::size_t at = 0; at < n; ++at) {
      std::string b = a;
      b[at] = 'K';
      EXPECT_FALSE(sameText(a, b)) << n << " " << at;
    }
  }
}

TEST(PercentEscape, EscapesQuerySyntaxAndKeepsUnreserved) {
  for (const auto& [text, escaped] : {std::pair{"a&b=c%d", "a%26b%3Dc%25d"}, {"AZaz09-._~", "AZaz09-._~"},
                                      {"a b+c/d?#", "a%20b%2Bc%2Fd%3F%23"}, {"é", "%C3%A9"}}) {
    EXPECT_EQ(encodeToPercentEscape(text), escaped);
  }
}

TEST(PercentEscape, DecodeIsTheExactInverse) {
  std::mt19937 rng(7);
  for (int round = 0; round < 2000; ++round) {
    // Random valid UTF-8: ASCII including the query's own syntax, plus some multi-byte characters.
    std::string text;
    const int n = static_cast<int>(rng() % 24);
    for (int i = 0; i < n; ++i) {
      switch (rng() % 4) {
        case 0: text += "é"; break;
        case 1: text += "漢"; break;
        default: text += static_cast<char>(32 + rng() % 95); break;
      }
    }
    const std::string escaped = encodeToPercentEscape(text);
    EXPECT_EQ(escaped.find_first_of("&= +"), std::string::npos) << escaped;
    EXPECT_EQ(decodeFromPercentEscape(escaped), text);
  }
}

TEST(PercentEscape, BrokenEscapesDecodeToNothing) {
  for (const char* bad : {"%", "%4", "abc%", "%zz", "%G1", "%C3", "%G3%80%80%80"}) {
    EXPECT_FALSE(decodeFromPercentEscape(bad)) << bad;
  }
  EXPECT_EQ(decodeFromPercentEscape("%41%62c"), "Abc");
  EXPECT_EQ(decodeFromPercentEscape("%c3%a9"), "é");  // lower-case hex is accepted
}

TEST(Numeric, WholeTextMustBeOneNumber) {
  for (const char* yes : {"0", "42", "-7", "+7", "3.5", ".5", "5.", "1e9", "2E-3", "0010"}) {
    EXPECT_TRUE(isNumeric(yes)) << yes;
  }
  for (const char* no : {"", "-", ".", "e5", "1e", "1e+", " 1", "1 ", "1,5", "0x10", "٣", "1.2.3", "abc"}) {
    EXPECT_FALSE(isNumeric(no)) << no;
  }
  for (const std::string_view longer : {"123", "1.55", "1e55"}) {  // a view ends where it ends, digits after it or not
    EXPECT_TRUE(isNumeric(longer.substr(0, longer.size() - 1))) << longer;
  }
}

TEST(Numeric, LeadingIntegerSaturates) {
  // Between the blanks strtol skips and the first character that is no digit.
  const std::pair<const char*, std::int32_t> cases[] = {
      {"9999999999", INT32_MAX}, {"-9999999999", INT32_MIN}, {"2147483647", INT32_MAX}, {"-2147483648", INT32_MIN},
      {"3.99", 3}, {" \t\n\v\f\r-12abc", -12}, {"1e5", 1}, {"abc", 0}};
  for (const auto& [text, value] : cases) EXPECT_EQ(leadingInteger32(text), value) << text;
  EXPECT_EQ(leadingInteger64("-9223372036854775808"), INT64_MIN);
  EXPECT_EQ(leadingInteger64("99999999999999999999"), INT64_MAX);
  EXPECT_EQ(leadingInteger64("9223372036854775806"), INT64_MAX - 1);  // one below the cut
}

TEST(Numeric, DescriptionsReadBackAsTheSameNumber) {
  for (const auto& [number, text] : {std::pair{42.0, "42"}, {-0.0, "0"}, {3.5, "3.5"}, {0.1, "0.1"}, {1e20, "1e+20"}}) {
    EXPECT_EQ(numberDescription(number), text);
  }
  for (double d : {1.0 / 3.0, 123456.789, -2.2250738585072014e-308}) EXPECT_EQ(std::stod(numberDescription(d)), d);
}

TEST(Utf8, Validation) {
  EXPECT_TRUE(isValidUtf8("plain é 漢 😀"));
  // The first and last code point of each length are valid; one below each first is overlong.
  EXPECT_TRUE(isValidUtf8("\xC2\x80 \xDF\xBF \xE0\xA0\x80 \xEF\xBF\xBF \xF0\x90\x80\x80 \xF4\x8F\xBF\xBF"));
  // Overlong forms, a surrogate, a code point beyond U+10FFFF, a truncated character.
  for (const char* bad :
       {"\xC0\xAF", "\xC1\xBF", "\xE0\x9F\xBF", "\xF0\x8F\xBF\xBF", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xE6\xBC"}) {
    EXPECT_FALSE(isValidUtf8(bad));
  }
}

}  // namespace
}  // namespace kyn::platform
