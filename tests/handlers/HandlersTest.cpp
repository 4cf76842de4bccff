#include "account/Common.h"
#include "handlers/KYNAXSearch.h"
#include "handlers/KYNAXSetGeoFence.h"
#include "handlers/KYNAXVisibility.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

class HandlersTest : public test::PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    search.friends = std::vector{test::makePerson({"ada@example.com"}, {})};
    fence.friend_ = test::makePerson({"ada@example.com"}, {});
  }
  /// The error code each handler's validation ends with (0: passed), in the order search,
  /// visibility, geofence.
  std::vector<std::int64_t> codes() {
    std::vector<std::int64_t> out;
    for (const auto& failure : {search._validate(), visibility._validate(), fence._validate()}) {
      out.push_back(failure ? failure->errorCode.value_or(-1) : 0);
    }
    return out;
  }
  /// Every reply of a perform, each of which must have come before perform returned.
  template <class Handler>
  std::vector<Value> perform(Handler& handler) {
    std::vector<Value> replies;
    handler.performWithCompletion([&](const Value& r) { replies.push_back(r); });
    return replies;
  }

  KYNAXSearch search;
  KYNAXVisibility visibility;
  KYNAXSetGeoFence fence;
};

TEST_F(HandlersTest, AccountChecksInTheirOrder) {
  using V = std::vector<std::int64_t>;
  EXPECT_EQ(codes(), (V{0, 0, 0}));
  session->restricted = true;  // only the visibility command asks, before the account
  systemInfo->signOut();
  EXPECT_EQ(codes(), (V{AXKynNotLoggedInErrorCode, AXKynServiceNotAvailableErrorCode, AXKynNotLoggedInErrorCode}));
  session->restricted = false;
  systemInfo->signIn("P-1", std::nullopt);
  session->provisioned = false;  // whatever the token
  EXPECT_EQ(codes(), V(3, AXKynServiceRestrictedInAccountErrorCode));
  session->provisioned = true;
  EXPECT_EQ(codes(), V(3, AXKynLockedErrorCode));

  // A cached account is dropped before the checks, so that signing out is seen at once; a
  // restricted user's visibility command leaves it cached.
  systemInfo->signIn();
  Common::sharedInstance().loadAccountInfo();
  session->restricted = true;
  (void)visibility._validate();
  EXPECT_TRUE(Common::sharedInstance().accountInfoLoaded());
  systemInfo->signOut();
  EXPECT_EQ(search._validate()->errorCode, AXKynNotLoggedInErrorCode);
}

TEST_F(HandlersTest, ASearchNeedsAHandleOfItsLastPersonOrAPlaceAndAFenceAHandleOrAPlace) {
  const auto refused = [](const std::shared_ptr<AXCommandFailed>& failure) {
    return failure && failure->dictionary() == Value::parse(R"({"class":"AXCommandFailed",
                                                               "reason":"Need at least emails or current location"})");
  };
  Common::sharedInstance().loadAccountInfo();
  search.friends = std::vector{test::makePerson({"a@example.com"}, {"+15035550101"}), test::makePerson({}, {})};
  EXPECT_TRUE(refused(search._validate()));
  search.friends->back()->emails.emplace();  // present but empty
  EXPECT_TRUE(refused(search._validate()));
  EXPECT_TRUE(Common::sharedInstance().accountInfoLoaded()) << "no account check may run";
  search.friends = std::vector{test::makePerson({}, {}), test::makePerson({}, {std::nullopt})};
  EXPECT_FALSE(search._validate());
  search.friends.reset();
  search.currentLocation = std::make_shared<AXLocation>();
  EXPECT_FALSE(search._validate());
  search.currentLocation.reset();
  search.proximity = "near";
  EXPECT_FALSE(search._validate());

  fence.friend_ = test::makePerson({}, {});
  fence.friend_->emails.emplace();
  EXPECT_TRUE(refused(fence._validate()));
  fence.friend_ = test::makePerson({}, {"(503) 555-0101"});
  EXPECT_FALSE(fence._validate());
  fence.friend_.reset();
  fence.requestedLocation = std::make_shared<AXLocation>();
  EXPECT_FALSE(fence._validate());
}

TEST_F(HandlersTest, AFailureAnswersAtOnceAndAPassedCommandGoesToTheDataSource) {
  systemInfo->signOut();
  visibility.visible = true;
  for (const auto& replies : {perform(search), perform(visibility), perform(fence)}) {
    ASSERT_EQ(replies.size(), 1u);
    EXPECT_EQ(replies[0]["errorCode"], AXKynNotLoggedInErrorCode);
  }
  EXPECT_TRUE(controller->sent().empty());

  systemInfo->signIn();
  controller->autoResponse = test::FakeResponse{true, 200, R"({"statusCode":200})"};
  EXPECT_EQ(perform(search).at(0)["class"], "AXKynSearchCompleted");
  EXPECT_EQ(perform(visibility).at(0)["class"], "AXKynVisibilitySetCompleted");
  EXPECT_EQ(perform(fence).at(0)["class"], "AXKynGeoFenceSetCompleted");
  EXPECT_EQ(controller->sent().size(), 3u);
}

// The handlers' own log lines are fixed texts of the system.
TEST_F(HandlersTest, TheProgressLines) {
  controller->autoResponse = test::FakeResponse{true, 200, R"({"statusCode":200})"};
  (void)perform(search);
  EXPECT_EQ(logMessages(), (std::vector<std::string>{
                       R"(search: <KYNAXSearch {"class":"AXKynSearch","friends":[{"class":"AXPerson","emails":[{"class":"AXEmail","emailAddress":"ada@example.com"}]}]}>)",
                       "Validation successful.", R"(getlocations_resultDictionary_raw: {"statusCode":200})",
                       "serverContextDictionary: (null)", "location result: ()", "Result: ()"}));
  log->clear();
  search.friends.reset();
  (void)perform(search);
  EXPECT_EQ(log->messages(platform::LogLevel::Error),
            std::vector<std::string>{"Validate returning status <AXCommandFailed {\"class\":\"AXCommandFailed\","
                                     "\"reason\":\"Need at least emails or current location\"}>"});

  log->clear();
  (void)perform(visibility);
  const auto progress = logMessages();
  ASSERT_GE(progress.size(), 6u);
  EXPECT_EQ(std::vector<std::string>(progress.begin(), progress.begin() + 6),
            (std::vector<std::string>{"KYNAXVisibility validate", "KYNAXVisibility clearing KYNAccount",
                                      "KYNAXVisibility Checking provisionning", "KYNAXVisibility Checking auth token",
                                      "KYNAXVisibility performWithCompletion (null)",
                                      "KYNAXDataSource: SetVisibility with completion"}));
  log->clear();
  session->restricted = true;
  (void)perform(visibility);
  EXPECT_EQ(logMessages(), (std::vector<std::string>{"KYNAXVisibility validate", "App is restricted, cannot change visibility",
                                                     "KYNAXVisibility performWithCompletion <AXCommandFailed {\"class\":"
                                                     "\"AXCommandFailed\",\"errorCode\":1005}>"}));
}

}  // namespace
}  // namespace kyn
