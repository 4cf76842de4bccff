#include "utils/KYNAXUtils.h"

#include <gtest/gtest.h>

namespace kyn {
namespace {

std::optional<std::string> urlFor(const char* json) {
  const Value v = Value::parse(json);
  return KYNAXUtils::contextIdentifierURLForDictionary(&v);
}

TEST(ContextURL, TheTokenNeverGoesIntoTheURL) {
  EXPECT_EQ(urlFor(R"({"authToken":"t","clientId":"abc"})"), "kynServerContext://serverContext?clientId=abc&");
}

TEST(ContextURL, EmptyAndAbsentDictionaries) {
  EXPECT_EQ(urlFor("{}"), "kynServerContext://serverContext?");
  EXPECT_EQ(urlFor(R"({"authToken":"t"})"), "kynServerContext://serverContext?");
  EXPECT_FALSE(KYNAXUtils::contextIdentifierURLForDictionary(nullptr));
  const Value notAnObject = Value::parse(R"(["a"])");
  EXPECT_FALSE(KYNAXUtils::contextIdentifierURLForDictionary(&notAnObject));
}

TEST(ContextURL, ValuesAreWrittenInOrderAsTheirText) {
  EXPECT_EQ(urlFor(R"({"n":42,"f":2.5,"t":true,"no":false,"z":null})"),
            "kynServerContext://serverContext?n=42&f=2.5&t=1&no=0&z=%3Cnull%3E&");
}

TEST(ContextURL, RoundTripKeepsStringsWholeAndNarrowsNumbers) {
  const Value original = Value::parse(R"({
      "query":"a&b=c%d e+f","unicode key ✓":"Zürich 東京","n":42,"fraction":3.99,"big":12345678901,
      "neg":-7,"yes":true,"no":false,"authToken":"secret","numericText":"0012"})");
  const auto url = KYNAXUtils::contextIdentifierURLForDictionary(&original);
  ASSERT_TRUE(url);
  EXPECT_EQ(url->find("secret"), std::string::npos);
  const Value back = KYNAXUtils::contextDictionaryForURL(*url);
  EXPECT_EQ(back, Value::parse(R"({
      "query":"a&b=c%d e+f","unicode key ✓":"Zürich 東京","n":42,"fraction":3,"big":2147483647,
      "neg":-7,"yes":1,"no":0,"numericText":12})"));
}

TEST(ContextURL, ReadingNumbersAndStrings) {
  const Value d = KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?n=42&s=x&");
  EXPECT_EQ(d, Value::parse(R"({"n":42,"s":"x"})"));
  EXPECT_TRUE(d["n"].is_number_integer());
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?v=9999999999&")["v"], 2147483647);
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?v=-9999999999&")["v"], -2147483648);
}

TEST(ContextURL, MalformedPairsAreSkipped) {
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?a=1=2&b"), Value::object());
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?&&=&x=%zz&%=1&ok=%41&y=%E2%82&"),
            Value::parse(R"({"":"","ok":"A"})"));
}

TEST(ContextURL, LaterKeysReplaceEarlierOnes) {
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?k=1&k=two&"),
            Value::parse(R"({"k":"two"})"));
}

TEST(ContextURL, OnlyTheLengthOfThePrefixIsDropped) {
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("https://not-our-kind-of-url.test?k=v&"), Value::parse(R"({"k":"v"})"));
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://"), Value::object());
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL(""), Value::object());
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?"), Value::object());
}

}  // namespace
}  // namespace kyn
