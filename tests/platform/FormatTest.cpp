#include "platform/assistant/Model.h"
#include "platform/log/Format.h"

#include <gtest/gtest.h>

namespace kyn::platform {
namespace {

TEST(Format, RendersEachPlaceholderKind) {
  EXPECT_EQ(format("search: %@", std::string("x")), "search: x");
  EXPECT_EQ(format("ERROR: Server HTTP Status: %ld", 401), "ERROR: Server HTTP Status: 401");
  EXPECT_EQ(format("%d/%li/%i/%u/%hd/%qd/%zu", -1, 2L, 3, 4u, 5, 6, 7u), "-1/2/3/4/5/6/7");
  EXPECT_EQ(format("Unit:%li", std::int64_t{-9'000'000'000}), "Unit:-9000000000");
  EXPECT_EQ(format("100%% sure"), "100% sure");
  EXPECT_EQ(format("%@", 2.5), "2.5");
  EXPECT_EQ(format("%@", true), "1");
  EXPECT_EQ(format("%2$@ (%1$@)", "Paris", "IDF"), "IDF (Paris)");  // positions let translations reorder
  EXPECT_EQ(format("%1$@, %2$@", "Paris", "IDF"), "Paris, IDF");
}

TEST(Format, AbsentObjectsPrintNullAndObjectsTheirDescription) {
  std::optional<std::string> none;
  std::shared_ptr<AXPerson> nobody;
  const Value* noValue = nullptr;
  EXPECT_EQ(format("%@ %@ %@ %@", none, nobody, noValue, nullptr), "(null) (null) (null) (null)");
  auto person = std::make_shared<AXPerson>();
  person->firstName = "Ada";
  EXPECT_EQ(format("AXPerson found: %@", person), R"(AXPerson found: <AXPerson {"class":"AXPerson","firstName":"Ada"}>)");
  Value v = {{"a", 1}};
  EXPECT_EQ(format("%@", v), R"({"a":1})");
  std::vector<std::shared_ptr<AXEmail>> list{std::make_shared<AXEmail>(), nullptr};
  EXPECT_EQ(format("%@", list), R"((<AXEmail {"class":"AXEmail"}>, (null)))");
}

TEST(Format, OddFormatsNeitherCrashNorConsumeArguments) {
  EXPECT_EQ(format("%q"), "%q");          // length modifier then the end
  EXPECT_EQ(format("%"), "%");
  EXPECT_EQ(format(std::string_view("%d").substr(0, 1)), "%");  // nothing is read past the end
  EXPECT_EQ(format("%y %@", "a"), "%y a");  // unknown conversion keeps the argument
  EXPECT_EQ(format("%@ and %@", "one"), "one and ");
  EXPECT_EQ(format("%9$@", "one"), "");
}

}  // namespace
}  // namespace kyn::platform
