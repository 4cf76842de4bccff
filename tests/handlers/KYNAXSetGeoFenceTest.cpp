#include "account/Common.h"
#include "handlers/KYNAXSetGeoFence.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

class KYNAXSetGeoFenceTest : public test::PlatformTest {};

// A fence needs a handle of the friend or a place; without either the account is not even looked at.
TEST_F(KYNAXSetGeoFenceTest, TheTargetIsAHandleOfTheFriendOrAPlace) {
  systemInfo->signIn();
  KYNAXSetGeoFence fence;
  fence.friend_ = test::makePerson({}, {});
  fence.friend_->emails.emplace();  // present but empty
  Common::sharedInstance().loadAccountInfo();
  const auto refused = fence._validate();
  ASSERT_TRUE(refused);
  EXPECT_EQ(refused->dictionary(),
            Value::parse(R"({"class":"AXCommandFailed","reason":"Need at least emails or current location"})"));
  EXPECT_TRUE(Common::sharedInstance().accountInfoLoaded()) << "no account check may run";
  EXPECT_TRUE(logMessages().empty()) << "validation logs nothing";

  fence.requestedLocation = std::make_shared<AXLocation>();  // a place alone
  fence.friend_.reset();
  EXPECT_FALSE(fence._validate());
  fence.requestedLocation.reset();
  fence.friend_ = test::makePerson({}, {"(503) 555-0101"});  // phones alone
  EXPECT_FALSE(fence._validate());
  systemInfo->signOut();
  EXPECT_EQ(fence._validate()->errorCode, AXKynNotLoggedInErrorCode);
}

}  // namespace
}  // namespace kyn
