#include "utils/KYNAXUtils.h"

#include <gtest/gtest.h>

namespace kyn {
namespace {

std::optional<std::string> urlFor(const char* json) {
  const Value v = Value::parse(json);
  return KYNAXUtils::contextIdentifierURLForDictionary(&v);
}

Value read(const std::string& query) {
  return KYNAXUtils::contextDictionaryForURL("kynServerContext://serverContext?" + query);
}

TEST(ContextURL, PairsInOrderAsTheirTextWithoutTheToken) {
  EXPECT_EQ(urlFor(R"({"authToken":"t","clientId":"abc"})"), "kynServerContext://serverContext?clientId=abc&");
  EXPECT_EQ(urlFor(R"({"n":42,"f":2.5,"t":true,"no":false,"z":null})"),
            "kynServerContext://serverContext?n=42&f=2.5&t=1&no=0&z=%3Cnull%3E&");
  EXPECT_EQ(urlFor("{}"), "kynServerContext://serverContext?");
  EXPECT_EQ(urlFor(R"({"authToken":"t"})"), "kynServerContext://serverContext?");
  EXPECT_FALSE(KYNAXUtils::contextIdentifierURLForDictionary(nullptr));
  EXPECT_FALSE(urlFor(R"(["a"])"));
}

TEST(ContextURL, RoundTripKeepsStringsWholeAndNarrowsNumbers) {
  const Value original = Value::parse(R"({"query":"a&b=c%d e+f","unicode key ✓":"Zürich 東京","n":42,"fraction":3.99,
      "big":12345678901,"neg":-7,"yes":true,"no":false,"authToken":"secret","numericText":"0012"})");
  const auto url = KYNAXUtils::contextIdentifierURLForDictionary(&original);
  ASSERT_TRUE(url);
  EXPECT_EQ(url->find("secret"), std::string::npos);
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL(*url), Value::parse(R"({"query":"a&b=c%d e+f","unicode key ✓":"Zürich 東京",
      "n":42,"fraction":3,"big":2147483647,"neg":-7,"yes":1,"no":0,"numericText":12})"));
}

TEST(ContextURL, Reading) {
  const Value d = read("n=42&s=x&");
  EXPECT_EQ(d, Value::parse(R"({"n":42,"s":"x"})"));
  EXPECT_TRUE(d["n"].is_number_integer());
  EXPECT_EQ(read("k=1&k=two&"), Value::parse(R"({"k":"two"})"));  // a later key replaces an earlier one
  // Malformed pairs are skipped.
  EXPECT_EQ(read("a=1=2&b"), Value::object());
  EXPECT_EQ(read("&&=&x=%zz&%=1&ok=%41&y=%E2%82&"), Value::parse(R"({"":"","ok":"A"})"));
  // Only the length of the prefix is dropped, whatever it holds.
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL("https://not-our-kind-of-url.test?k=v&"), Value::parse(R"({"k":"v"})"));
  for (const char* text : {"kynServerContext://", "", "kynServerContext://serverContext?"}) {
    EXPECT_EQ(KYNAXUtils::contextDictionaryForURL(text), Value::object()) << text;
  }
}

}  // namespace
}  // namespace kyn
