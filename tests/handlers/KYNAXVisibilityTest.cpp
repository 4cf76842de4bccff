#include "account/Common.h"
#include "datasource/KYNAXDataSource.h"
#include "handlers/KYNAXVisibility.h"
#include "support/ControllerTest.h"

namespace kyn {
namespace {

class KYNAXVisibilityTest : public test::ControllerTest {
 protected:
  void SetUp() override {
    ControllerTest::SetUp();
    controller->autoResponse = test::FakeResponse{true, 200, R"({"statusCode":200})"};
  }
  std::vector<Value> perform() {
    KYNAXVisibility command;
    command.visible = false;
    std::vector<Value> replies;
    command.performWithCompletion([&](const Value& r) { replies.push_back(r); });
    return replies;
  }
};

TEST_F(KYNAXVisibilityTest, ARestrictedUserKeepsTheAccountAndTheRestIsCheckedInOrder) {
  systemInfo->signIn();
  Common::sharedInstance().loadAccountInfo();
  session->restricted = true;
  auto replies = perform();
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0]["errorCode"], AXKynServiceNotAvailableErrorCode);
  EXPECT_TRUE(Common::sharedInstance().accountInfoLoaded()) << "the account must not be cleared";
  EXPECT_TRUE(controller->sent().empty());
  EXPECT_EQ(logMessages(), (std::vector<std::string>{"KYNAXVisibility validate", "App is restricted, cannot change visibility",
                                                     "KYNAXVisibility performWithCompletion <AXCommandFailed {\"class\":"
                                                     "\"AXCommandFailed\",\"errorCode\":1005}>"}));

  // Not provisioned: the token is not looked at.
  session->restricted = false;
  session->provisioned = false;
  log->clear();
  EXPECT_EQ(perform().at(0)["errorCode"], AXKynServiceRestrictedInAccountErrorCode);
  EXPECT_FALSE(log->contains("KYNAXVisibility Checking auth token"));

  session->provisioned = true;
  log->clear();
  replies = perform();
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0]["class"], "AXKynVisibilitySetCompleted");
  const auto messages = logMessages();
  ASSERT_GE(messages.size(), 6u);
  EXPECT_EQ(std::vector<std::string>(messages.begin(), messages.begin() + 6),
            (std::vector<std::string>{"KYNAXVisibility validate", "KYNAXVisibility clearing KYNAccount",
                                      "KYNAXVisibility Checking provisionning", "KYNAXVisibility Checking auth token",
                                      "KYNAXVisibility performWithCompletion (null)",
                                      "KYNAXDataSource: SetVisibility with completion"}));
}

}  // namespace
}  // namespace kyn
