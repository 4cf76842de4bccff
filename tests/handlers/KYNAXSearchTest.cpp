#include "account/Common.h"
#include "datasource/KYNAXDataSource.h"
#include "handlers/KYNAXSearch.h"
#include "support/ControllerTest.h"

namespace kyn {
namespace {

class KYNAXSearchTest : public test::ControllerTest {
 protected:
  void SetUp() override {
    ControllerTest::SetUp();
    controller->autoResponse = test::FakeResponse{true, 200, R"({"locations":{}})"};
  }
  /// Performs and returns every reply, checking that each came before perform returned.
  std::vector<Value> perform(KYNAXSearch& search) {
    std::vector<Value> replies;
    search.performWithCompletion([&](const Value& r) { replies.push_back(r); });
    return replies;
  }
};

TEST_F(KYNAXSearchTest, WithoutATargetTheReasonAnswersAndTheAccountIsKeptCached) {
  systemInfo->signIn();
  Common::sharedInstance().loadAccountInfo();
  KYNAXSearch search;
  const auto replies = perform(search);
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0], Value::parse(R"({"class":"AXCommandFailed","reason":"Need at least emails or current location"})"));
  EXPECT_TRUE(Common::sharedInstance().accountInfoLoaded()) << "no account check may run";
  EXPECT_TRUE(controller->sent().empty());
  EXPECT_EQ(log->messages(platform::LogLevel::Error).size(), 1u);
  EXPECT_TRUE(log->contains("Validate returning status <AXCommandFailed"));
}

TEST_F(KYNAXSearchTest, OnlyTheLastPersonCountsAsATarget) {
  systemInfo->signIn();
  KYNAXSearch search;
  search.friends = std::vector{test::makePerson({std::nullopt}, {std::nullopt}), test::makePerson({}, {})};
  EXPECT_TRUE(search._validate()->reason);
  search.friends = std::vector{test::makePerson({}, {}), test::makePerson({}, {std::nullopt})};
  EXPECT_FALSE(search._validate());
  search.friends = std::vector<std::shared_ptr<AXPerson>>{};
  search.currentLocation = std::make_shared<AXLocation>();
  EXPECT_FALSE(search._validate());
  search.currentLocation.reset();
  search.proximity = "near";
  EXPECT_FALSE(search._validate());
  search.proximity.reset();
  search.friends = std::vector{test::makePerson({}, {})};
  search.friends->back()->emails.emplace();  // present but empty
  EXPECT_TRUE(search._validate());
}

TEST_F(KYNAXSearchTest, AccountChecksInTheirOrder) {
  KYNAXSearch search;
  search.friends = std::vector{test::makePerson({std::nullopt}, {})};
  // A cached account is dropped before the checks: signing out is seen at once.
  systemInfo->signIn();
  Common::sharedInstance().loadAccountInfo();
  systemInfo->signOut();
  EXPECT_EQ(search._validate()->errorCode, AXKynNotLoggedInErrorCode);

  systemInfo->signIn("P-1", std::nullopt);
  session->provisioned = false;
  EXPECT_EQ(search._validate()->errorCode, AXKynServiceRestrictedInAccountErrorCode);
  session->provisioned = true;
  EXPECT_EQ(search._validate()->errorCode, AXKynLockedErrorCode);
  systemInfo->signIn();
  EXPECT_FALSE(search._validate());
  EXPECT_TRUE(log->contains("Validation successful."));
}

TEST_F(KYNAXSearchTest, AFailureAnswersAtOnceWithoutAskingTheServer) {
  KYNAXSearch search;
  search.proximity = "near";
  const auto replies = perform(search);
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0]["errorCode"], AXKynNotLoggedInErrorCode);
  EXPECT_TRUE(controller->sent().empty());
}

TEST_F(KYNAXSearchTest, AValidSearchGoesToTheDataSource) {
  systemInfo->signIn();
  KYNAXSearch search;
  search.friends = std::vector{test::makePerson({std::nullopt}, {})};
  search.friends->back()->emails->back()->emailAddress = "ada@example.com";
  const auto replies = perform(search);
  ASSERT_EQ(controller->sent().size(), 1u);
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0]["class"], "AXKynSearchCompleted");
  const auto messages = logMessages();
  ASSERT_GE(messages.size(), 2u);
  EXPECT_TRUE(messages[0].starts_with("search: <KYNAXSearch {\"class\":\"AXKynSearch\""));
  EXPECT_EQ(messages[1], "Validation successful.");
}

}  // namespace
}  // namespace kyn
