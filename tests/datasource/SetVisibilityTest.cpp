#include "commands/ShowHideLocationCmd.h"
#include "datasource/KYNAXDataSource.h"
#include "support/ControllerTest.h"

namespace kyn {
namespace {

class SetVisibilityTest : public test::ControllerTest {
 protected:
  void SetUp() override {
    ControllerTest::SetUp();
    systemInfo->signIn();
  }
};

TEST_F(SetVisibilityTest, EachOutcomeGivesOneReply) {
  constexpr std::int64_t kNotAvailable = AXKynServiceNotAvailableErrorCode;
  struct Row {
    const char* name;
    bool visible;
    test::FakeResponse response;
    std::optional<std::int64_t> errorCode;  // nothing: completed
  };
  const Row rows[] = {
      {"any positive body status is success", false, {true, 200, R"({"statusCode":500,"serverContext":{"c":"1"}})"}, {}},
      {"a status given as text", true, {true, 200, R"({"statusCode":"200","serverContext":{"c":"1"}})"}, {}},
      {"body status 0", false, {true, 200, R"({"statusCode":0})"}, kNotAvailable},
      {"a negative body status", false, {true, 200, R"({"statusCode":-1})"}, kNotAvailable},
      {"no body status", false, {true, 200, R"({"myInfo":{}})"}, kNotAvailable},
      {"a body that does not parse", false, {true, 200, "<html>"}, kNotAvailable},
      {"HTTP 401 is not told apart", false, {false, 401, R"({"statusCode":401})"}, kNotAvailable},
      {"no answer at all", true, {false, std::nullopt, ""}, kNotAvailable},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.name);
    AXKynVisibilityStateSet command;
    command.visible = row.visible;
    std::vector<Value> replies;
    KYNAXDataSource::dataSource().setVisibility(command, [&](const Value& r) { replies.push_back(r); });
    auto sent = std::dynamic_pointer_cast<ShowHideLocationCmd>(controller->sent().back());
    ASSERT_TRUE(sent);
    EXPECT_EQ(sent->hideLocation, !row.visible);
    EXPECT_TRUE(replies.empty());
    test::completeCommand(sent, row.response);
    ASSERT_EQ(replies.size(), 1u);
    EXPECT_FALSE(sent->completionBlock()) << "the callback must break the cycle";
    if (row.errorCode) {
      EXPECT_EQ(replies[0], AXCommandFailed::commandFailedWithErrorCode(*row.errorCode)->dictionary());
    } else {
      EXPECT_EQ(replies[0], Value::parse(R"({"class":"AXKynVisibilitySetCompleted",
                                             "searchContext":"kynServerContext://serverContext?c=1&"})"));
    }
  }
  EXPECT_TRUE(log->contains("ERROR: Server HTTP Status: 401"));
}

}  // namespace
}  // namespace kyn
