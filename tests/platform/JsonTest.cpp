#include "platform/value/Json.h"
#include "support/Fakes.h"

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <random>

namespace kyn::platform {
namespace {

TEST(Json, ParsesDocumentsKeepingKeyOrder) {
  auto v = parseJson(R"({"z":1,"a":[true,null,"x"],"m":{"k":2.5}})");
  ASSERT_TRUE(v);
  std::vector<std::string> keys;
  for (const auto& [k, _] : v->items()) keys.push_back(k);
  EXPECT_EQ(keys, (std::vector<std::string>{"z", "a", "m"}));
  EXPECT_EQ(parseJson("[18446744073709551616,null]").value_or(Value()).size(), 2u);  // read by the slower reader
  auto document = parseJsonDocument(R"({"z":1})").value();
  document = parseJsonDocument("[2]").value();
  EXPECT_EQ(toJson(document.root()), "[2]");
}

TEST(Json, DuplicateKeysKeepTheLastValueAtTheFirstPosition) {
  // Small objects search linearly, large ones through an index: both must agree.
  for (int members : {3, 40}) {
    std::string text = "{";
    for (int i = 0; i < members; ++i) text += "\"k" + std::to_string(i) + "\":" + std::to_string(i) + ",";
    text += "\"k1\":\"again\"}";
    auto v = parseJson(text);
    ASSERT_TRUE(v) << members;
    EXPECT_EQ(v->size(), static_cast<std::size_t>(members));
    EXPECT_EQ((*v)["k1"], "again");
    EXPECT_EQ(std::next(v->begin()).key(), "k1");
  }
}

TEST(Json, RejectsWhatIsNotOneValidDocument) {
  for (const char* bad : {"", "{", "[1,]", "{\"a\":1}x", "tru", "\"\\uD800\"", "[\"\\udc00\"]", "1e999", "-1e400", "\"a\tb\""}) {
    EXPECT_FALSE(parseJson(bad)) << bad;
  }
  EXPECT_FALSE(parseJson(std::string("\"\xC3\x28\"")));  // invalid UTF-8
  EXPECT_FALSE(parseJson(std::string("\"\xED\xA0\x80\"")));  // an encoded surrogate
  EXPECT_FALSE(parseJson(std::string_view()));             // no text, not even a pointer to one
  EXPECT_FALSE(parseJson(std::string("[1]\0garbage", 11)));  // a NUL byte ends nothing
  EXPECT_FALSE(parseJson(std::string("\"a\0b\"", 5)));
}

TEST(Json, BoundsDepthAndSize) {
  JsonLimits limits;
  limits.maxDepth = 10;
  EXPECT_TRUE(parseJson(std::string(10, '[') + std::string(10, ']'), limits));
  EXPECT_FALSE(parseJson(std::string(11, '[') + std::string(11, ']'), limits));
  // A number takes two words of the reader's tape; the nesting right after one still counts.
  for (const char* number : {"1.5", "1", "18446744073709551615"}) {
    EXPECT_FALSE(parseJson(std::string("[") + number + "," + std::string(10, '[') + std::string(11, ']'), limits)) << number;
  }
  const JsonLimits scalarsOnly{.maxDepth = 0};
  EXPECT_TRUE(parseJson("1", scalarsOnly));
  EXPECT_FALSE(parseJson("[]", scalarsOnly) || parseJson("{}", scalarsOnly));
  // Far beyond the default depth: rejected without exhausting the stack.
  EXPECT_FALSE(parseJson(std::string(100000, '[') + std::string(100000, ']')));
  limits.maxBytes = 8;
  EXPECT_TRUE(parseJson("[1,2,3]", limits));
  EXPECT_FALSE(parseJson("[1,2,3,4]", limits));
}

TEST(Json, SerialisingEscapesWhatJsonMustAndReplacesInvalidUtf8) {
  Value v = Value::object();
  v["name"] = std::string("bad \xFF byte");
  v["all"] = {{"s", "q\"\\\n\x01\x7F é"}, {"i", -5}, {"u", 18446744073709551615u}, {"d", 30.0}, {"f", 0.1},
              {"nan", std::nan("")}, {"t", true}, {"n", nullptr}, {"a", {1, Value::array(), Value::object()}}};
  const std::string text = toJson(v);
  EXPECT_EQ(text, v.dump(-1, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace));
  EXPECT_NE(text.find("\xEF\xBF\xBD"), std::string::npos);
  EXPECT_TRUE(parseJson(text));
  const auto written = [](std::string_view input) {
    std::string out;
    JsonTextWriter(out).string(input);
    return out;
  };
  EXPECT_EQ(written("a\x01" "b\x1F"), R"("a\u0001b\u001f")");  // 0x1F: the last control character
  EXPECT_EQ(written("a\"b\\ ~"), R"("a\"b\\ ~")");
  EXPECT_EQ(written("a\x80"), "\"a\xEF\xBF\xBD\"");  // 0x80: the lowest byte that is no ASCII
  // Texts are scanned a block at a time (sixteen or eight bytes): every byte that needs care, at
  // every place of texts up to two blocks and a part long, alone and before another one, is written
  // as the library writes it.
  const auto asLibrary = [](const std::string& sample) { return Value(sample).dump(-1, ' ', false, Value::error_handler_t::replace); };
  for (std::size_t size = 1; size <= 40; ++size) {
    for (std::size_t at = 0; at < size; ++at) {
      for (const char special : {'\x00', '\x1F', '"', '\\', '\x7F', '\x80', '\xFF', ' '}) {
        std::string sample(size, '~');
        sample[at] = special;
        ASSERT_EQ(written(sample), asLibrary(sample)) << size << " " << at;
      }
      for (std::size_t later = at + 1; later < size; ++later) {
        std::string sample(size, '~');
        sample[at] = '"';
        sample[later] = '\x01';
        ASSERT_EQ(written(sample), asLibrary(sample)) << size << " " << at << " " << later;
      }
    }
  }
}

TEST(Json, ANumberIsWrittenAsTheLibraryWritesItOrShorterForTheSameDouble) {
  std::mt19937_64 random(7);
  std::vector<double> values{0.0001, 0.00012, -0.5, 30.0, 16777215.99999999, 16777216.5, 2147483647.25, 2147483648.5};
  for (int i = 0; i < 200000; ++i) {  // short decimals of every size, and any double at all
    const double decimal = static_cast<double>(random() % 100000000) / std::pow(10.0, static_cast<int>(random() % 12));
    const std::uint64_t bits = random();
    values.push_back(i % 3 == 0 ? std::bit_cast<double>(bits) : i % 2 ? -decimal : decimal);
  }
  for (const double value : values) {
    if (!std::isfinite(value)) continue;
    std::string out;
    JsonTextWriter(out).number(value);
    const std::string library = Value(value).dump();
    if (out == library) continue;
    const auto read = parseJson(out);
    ASSERT_TRUE(out.size() < library.size() && read && read->get<double>() == value) << out << " for " << library;
  }
}

TEST(Json, ValueReadersReadATreeAndADocumentAlike) {
  const std::string text =
      R"({"s":"x","n":7.9,"neg":-3.2,"b":true,"null":null,"big":1e300,"edge":9.223372036854775808e18,)"
      R"("u":18446744073709551615,"i":-5,"a":[1,{"k":2},"z"],"s":"12abc"})";
  const Value tree = *parseJson(text);
  const auto document = parseJsonDocument(text);
  ASSERT_TRUE(document);
  for (const JsonView v : {JsonView(&tree), document->root()}) {
    // "s" is there twice: the last value counts; 2^63 ("edge") itself does not fit either.
    for (const auto& [key, integer] : {std::pair<const char*, std::int64_t>{"s", 12}, {"n", 7}, {"neg", -3}, {"i", -5},
                                       {"b", 1}, {"null", 0}, {"missing", 0}, {"big", INT64_MAX}, {"edge", INT64_MAX},
                                       {"u", INT64_MAX}}) {
      EXPECT_EQ(integerValue(v.member(key)), integer) << key;
    }
    EXPECT_EQ(int32Value(v.member("u")), -1);
    EXPECT_TRUE(v.member("null").isNull());
    EXPECT_FALSE(v.memberNotNull("null"));
    EXPECT_FALSE(numberValue(v.member("b")));
    EXPECT_TRUE(v.member("i").isInteger() && !v.member("n").isInteger() && v.member("u").isNumber());
    EXPECT_EQ(boolValue(v.member("neg")), true);
    EXPECT_FALSE(stringValue(v.member("n")));
    std::optional<std::string> field = "before";  // set in place: a value that is no text empties it
    setStringValue(field, v.member("s"));
    EXPECT_EQ(field, "12abc");
    setStringValue(field, v.member("n"));
    EXPECT_FALSE(field);
    EXPECT_FALSE(v.member("a").member("k"));
    std::vector<std::string> items;
    for (const auto& item : v.member("a")) items.push_back(toJson(item.value.toValue()));
    EXPECT_EQ(items, (std::vector<std::string>{"1", R"({"k":2})", R"("z")"}));
    EXPECT_EQ(v.toValue(), tree);
    EXPECT_EQ(toJson(v.member("a")), R"([1,{"k":2},"z"])");
    EXPECT_EQ(toJson(v.member("a"), 1), toJson(tree["a"], 1));  // indented as a tree would be
    EXPECT_EQ(toJson(v.member("a"), 0), "[\n1,\n{\n\"k\": 2\n},\n\"z\"\n]");
    EXPECT_EQ(toJson(v.member("neg")), "-3.2");
  }
  EXPECT_EQ(member(nullptr, "s"), nullptr);
  EXPECT_EQ(member(Value::array(), "s"), nullptr);
}

// The JSONTestSuite corpus: y_ must parse, n_ must be rejected (the fuzz replay of the same corpus
// checks that nothing crashes and every document survives a round trip).
TEST(Json, OutsideCorpus) {
  auto dir = test::sharedTestData("json-parsing");
  if (!dir) GTEST_SKIP() << "../shared/testdata/json-parsing is not beside the project";
  int files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(*dir)) {
    const std::string name = entry.path().filename().string();
    if (entry.path().extension() != ".json") continue;
    const std::string text = test::readFile(entry.path());
    const auto parsed = parseJson(text);
    // Read where it stands, with room made after it, the text is left as it was.
    std::string roomy = text;
    const auto inPlace = parseJsonDocumentInPlace(roomy);
    EXPECT_EQ(roomy, text) << name;
    EXPECT_GE(roomy.capacity(), roomy.size() + 64) << name;  // the room the reader reads into
    ++files;
    if (name.starts_with("y_")) {
      EXPECT_TRUE(parsed) << name;
      // Written again from the parsed document, it reads as the same value.
      const auto document = parseJsonDocument(text);
      EXPECT_TRUE(document && parsed && parseJson(toJson(document->root())) == *parsed) << name;
      EXPECT_TRUE(inPlace && parsed && inPlace->root().toValue() == *parsed) << name;
    }
    if (name.starts_with("n_")) {
      EXPECT_FALSE(parsed || inPlace) << name;
    }
  }
  EXPECT_GE(files, 300);
}

}  // namespace
}  // namespace kyn::platform
