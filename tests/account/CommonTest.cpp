#include "account/Common.h"
#include "support/PlatformTest.h"

#include <thread>

namespace kyn {
namespace {

using platform::services;
using test::postRedirect;

class CommonTest : public test::PlatformTest {};

TEST_F(CommonTest, WithoutAnAccountEveryReadAsksTheStoreAgain) {
  systemInfo->signOut();
  Common common;
  EXPECT_FALSE(common.hasKYNUser() || common.personID() || common.appToken() || common.username());
  EXPECT_TRUE(common.tokenIsNotAccessible());
  EXPECT_EQ(systemInfo->accountReads, 5);  // one for each read
  systemInfo->signIn("P-1", std::nullopt);
  EXPECT_TRUE(common.hasKYNUser());  // found on the next read: present, yet locked without a token
  EXPECT_TRUE(common.tokenIsNotAccessible());
}

TEST_F(CommonTest, ALoadedAccountIsReadOnceUntilCleared) {
  systemInfo->signIn("P-9", "tok", "kyn.example.test", "grace@example.test");
  Common common;
  EXPECT_TRUE(common.hasKYNUser());
  EXPECT_EQ(std::tuple(common.personID(), common.appToken(), common.username(), common.kynHost()),
            std::tuple("P-9", "tok", "grace@example.test", "kyn.example.test"));
  EXPECT_FALSE(common.tokenIsNotAccessible());
  EXPECT_EQ(systemInfo->accountReads, 1);

  systemInfo->signIn("P-10", "tok2", "other.example.test");
  EXPECT_EQ(common.personID(), "P-9");  // still the loaded facts
  common.clearKYNAccount();
  EXPECT_FALSE(common.kynHost());  // clearing drops the host, and reading it loads nothing
  EXPECT_EQ(systemInfo->accountReads, 1);
  EXPECT_EQ(common.personID(), "P-10");
  EXPECT_EQ(common.kynHost(), "other.example.test");
  EXPECT_EQ(systemInfo->accountReads, 2);

  // Signed out meanwhile: cleared, nothing of the old account is left to use.
  systemInfo->signOut();
  common.clearKYNAccount();
  EXPECT_FALSE(common.hasKYNUser() || common.personID() || common.appToken() || common.username() || common.kynHost());
}

TEST_F(CommonTest, AFailedLoadKeepsThePreviousFacts) {
  Common common;
  common.loadAccountInfo();
  systemInfo->signOut();
  common.loadAccountInfo();
  EXPECT_EQ(common.personID(), "P-1001");
  EXPECT_FALSE(common.hasKYNUser());
}

TEST_F(CommonTest, ARedirectIsStoredUntilAnotherOrAFlush) {
  auto& common = Common::sharedInstance();  // the one instance that listens in the plug-in
  postRedirect("kyn.example.test", std::nullopt);  // not redirected
  EXPECT_FALSE(common.redirectedHost());
  postRedirect("kyn.example.test", "p07-kyn.example.test:8443");
  EXPECT_EQ(common.redirectedHost(), "p07-kyn.example.test:8443");
  ASSERT_EQ(log->records().size(), 1u);
  EXPECT_EQ(log->records()[0].message, "REDIRECT: kyn.example.test -> p07-kyn.example.test:8443");
  EXPECT_EQ(log->records()[0].level, platform::LogLevel::Info);
  postRedirect("p07-kyn.example.test:8443", "p08-kyn.example.test");
  EXPECT_EQ(common.redirectedHost(), "p08-kyn.example.test");
  common.flushRedirection();
  EXPECT_FALSE(common.redirectedHost());

  services().preferences.get()->setValue(PreferencesBundleID, RedirectedHostKey, Value(42));
  EXPECT_FALSE(common.redirectedHost());  // a value of the wrong type is none
}

TEST_F(CommonTest, UnregistersWhenDestroyed) {
  {
    Common common;
  }
  postRedirect("a.example", "b.example");  // would reach a destroyed object if still registered
  EXPECT_EQ(Common::sharedInstance().redirectedHost(), "b.example");
}

TEST_F(CommonTest, OsVersionIsShortenedAndCachedOnceKnown) {
  Common common;
  systemInfo->os.reset();
  EXPECT_FALSE(common.osVersion());
  EXPECT_FALSE(common.osVersion());
  EXPECT_EQ(systemInfo->osVersionReads, 2);  // nothing was cached
  systemInfo->os = "10.15.7";
  EXPECT_EQ(common.osVersion(), "10.15");
  systemInfo->os = "11";
  EXPECT_EQ(common.osVersion(), "10.15");
  EXPECT_EQ(systemInfo->osVersionReads, 3);

  const std::pair<const char*, const char*> versions[] = {
      {"10.15", "10.15"}, {"11", "11"}, {"", ""}, {"12.", "12."}, {".5.1", ".5"}, {"1..2", "1."}};
  for (const auto& [version, shortened] : versions) EXPECT_EQ(shortenedOSVersion(version), shortened) << version;
}

// The host's thread uses the account while the network thread delivers redirects.
TEST_F(CommonTest, HostAndNetworkThreadsMayUseItAtOnce) {
  Common& common = Common::sharedInstance();
  std::thread network([] {
    for (int i = 0; i < 40; ++i) postRedirect("a.example", "h" + std::to_string(i % 3) + ".example");
  });
  for (int i = 0; i < 40; ++i) {
    common.clearKYNAccount();
    EXPECT_TRUE(common.hasKYNUser());
    (void)common.personID();
    (void)common.redirectedHost();
    (void)common.osVersion();
  }
  network.join();
  EXPECT_EQ(common.redirectedHost(), "h0.example");
}

}  // namespace
}  // namespace kyn
