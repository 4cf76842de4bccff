#include "account/Common.h"
#include "platform/net/JsonCommand.h"
#include "support/PlatformTest.h"

#include <sys/wait.h>
#include <unistd.h>

#include <thread>

namespace kyn {
namespace {

using platform::services;

class CommonTest : public test::PlatformTest {
 protected:
  static void postRedirect(std::optional<std::string> from, std::optional<std::string> to, bool redirected = true) {
    auto command = std::make_shared<platform::KYJSONCommand>();
    if (redirected) command->setRedirect(from.value_or(""), to.value_or(""));
    services().notificationCenter().post({std::string(platform::KYCommandRedirectedNotification), command});
  }
};

TEST_F(CommonTest, WithoutAnAccountEveryReadAsksTheStoreAgain) {
  Common common;
  EXPECT_FALSE(common.hasKYNUser());
  EXPECT_FALSE(common.personID());
  EXPECT_FALSE(common.appToken());
  EXPECT_FALSE(common.username());
  EXPECT_TRUE(common.tokenIsNotAccessible());
  EXPECT_FALSE(common.accountInfoLoaded());
  EXPECT_EQ(systemInfo->accountReads, 5);
  systemInfo->signIn();
  EXPECT_TRUE(common.hasKYNUser());  // found on the next read
}

TEST_F(CommonTest, ALoadedAccountIsReadOnceUntilCleared) {
  systemInfo->signIn("P-9", "tok", "kyn.example.test", "grace@example.test");
  Common common;
  EXPECT_TRUE(common.hasKYNUser());
  EXPECT_EQ(common.personID(), "P-9");
  EXPECT_EQ(common.appToken(), "tok");
  EXPECT_EQ(common.username(), "grace@example.test");
  EXPECT_EQ(common.kynHost(), "kyn.example.test");
  EXPECT_FALSE(common.tokenIsNotAccessible());
  EXPECT_TRUE(common.accountInfoLoaded());
  EXPECT_EQ(systemInfo->accountReads, 1);

  systemInfo->signIn("P-10", "tok2", "other.example.test");
  EXPECT_EQ(common.personID(), "P-9");  // still the loaded facts
  common.clearKYNAccount();
  EXPECT_FALSE(common.kynHost());  // clearing drops the host, and reading it loads nothing
  EXPECT_FALSE(common.kynHost());
  EXPECT_EQ(systemInfo->accountReads, 1);
  EXPECT_EQ(common.personID(), "P-10");
  EXPECT_EQ(common.kynHost(), "other.example.test");
  EXPECT_EQ(systemInfo->accountReads, 2);
}

TEST_F(CommonTest, AnAccountWithoutATokenIsPresentButLocked) {
  systemInfo->signIn("P-1", std::nullopt);
  Common common;
  EXPECT_TRUE(common.hasKYNUser());
  EXPECT_TRUE(common.tokenIsNotAccessible());
  EXPECT_TRUE(common.accountInfoLoaded());
}

TEST_F(CommonTest, AFailedLoadKeepsThePreviousFacts) {
  systemInfo->signIn("P-1");
  Common common;
  common.loadAccountInfo();
  systemInfo->signOut();
  common.loadAccountInfo();
  EXPECT_FALSE(common.isAccountPresent());
  EXPECT_TRUE(common.accountInfoLoaded());
  EXPECT_EQ(common.personID(), "P-1");
  EXPECT_FALSE(common.hasKYNUser());
}

TEST_F(CommonTest, FlagsStartAsDocumented) {
  Common common;
  EXPECT_FALSE(common.isRenewingAccountCredentials());
  EXPECT_TRUE(common.isKYNAllowed());
  systemInfo->signIn();
  EXPECT_TRUE(common.hasKYNUser());
  EXPECT_TRUE(common.isKYNAllowed());
  session->restricted = true;
  EXPECT_TRUE(common.isAppRestricted());
  EXPECT_TRUE(common.isKYNAllowed());
}

TEST_F(CommonTest, ARedirectIsStoredAndSurvivesANewProcess) {
  Common common;
  postRedirect("kyn.example.test", "p07-kyn.example.test:8443", /*redirected=*/false);
  EXPECT_FALSE(common.redirectedHost());

  postRedirect("kyn.example.test", "p07-kyn.example.test:8443");
  EXPECT_EQ(common.redirectedHost(), "p07-kyn.example.test:8443");
  EXPECT_TRUE(log->contains("REDIRECT: kyn.example.test -> p07-kyn.example.test:8443"));
  EXPECT_EQ(log->records().back().level, platform::LogLevel::Info);

  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    // A new process: nothing cached, the store read from disk.
    services().configure(configDir->path());
    _exit(Common().redirectedHost() == std::optional<std::string>("p07-kyn.example.test:8443") ? 0 : 1);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);

  common.flushRedirection();
  EXPECT_FALSE(common.redirectedHost());
}

TEST_F(CommonTest, ALaterRedirectReplacesTheStoredHost) {
  Common common;
  postRedirect("a.example", "b.example");
  postRedirect("b.example", "c.example");
  EXPECT_EQ(common.redirectedHost(), "c.example");
}

TEST_F(CommonTest, AStoredHostOfTheWrongTypeReadsAsNone) {
  auto store = services().preferences.get();
  store->setValue(PreferencesBundleID, RedirectedHostKey, Value(42));
  EXPECT_FALSE(Common().redirectedHost());
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
}

TEST(ShortenedOSVersion, KeepsTwoComponents) {
  EXPECT_EQ(shortenedOSVersion("10.15.7"), "10.15");
  EXPECT_EQ(shortenedOSVersion("10.15"), "10.15");
  EXPECT_EQ(shortenedOSVersion("11"), "11");
  EXPECT_EQ(shortenedOSVersion(""), "");
  EXPECT_EQ(shortenedOSVersion("12."), "12.");
  EXPECT_EQ(shortenedOSVersion(".5.1"), ".5");
  EXPECT_EQ(shortenedOSVersion("1..2"), "1.");
}

TEST_F(CommonTest, HandleKinds) {
  Common common;
  EXPECT_TRUE(common.isHandleEmail("ada@example.test"));
  EXPECT_TRUE(common.isHandleEmail("@@not really"));
  EXPECT_FALSE(common.isHandleEmail("+14085550100"));
}

// The host's thread uses the account while the network thread delivers redirects.
TEST_F(CommonTest, HostAndNetworkThreadsMayUseItAtOnce) {
  systemInfo->signIn();
  Common& common = Common::sharedInstance();
  std::thread network([] {
    for (int i = 0; i < 200; ++i) postRedirect("a.example", "h" + std::to_string(i % 3) + ".example");
  });
  for (int i = 0; i < 200; ++i) {
    common.clearKYNAccount();
    EXPECT_TRUE(common.hasKYNUser());
    (void)common.personID();
    (void)common.redirectedHost();
    (void)common.osVersion();
  }
  network.join();
  EXPECT_EQ(common.redirectedHost(), "h1.example");
}

}  // namespace
}  // namespace kyn
