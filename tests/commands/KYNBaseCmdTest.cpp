#include "account/Common.h"
#include "commands/KYNBaseCmd.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using platform::services;

class KYNBaseCmdTest : public test::PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    systemInfo->signIn("P-1001", "secret-token-42", "kyn.example.test");
  }
  static void storeRedirect(const std::string& host) {
    auto command = std::make_shared<platform::KYJSONCommand>();
    command->setRedirect("kyn.example.test", host);
    services().notificationCenter().post({std::string(platform::KYCommandRedirectedNotification), command});
  }
};

TEST_F(KYNBaseCmdTest, TakesSchemeCredentialsAndHostFromTheAccount) {
  KYNBaseCmd command;
  EXPECT_EQ(command.scheme(), "https");
  EXPECT_EQ(command.username(), "P-1001");
  EXPECT_EQ(command.password(), "secret-token-42");
  EXPECT_EQ(command.host(), "kyn.example.test");
}

TEST_F(KYNBaseCmdTest, AStoredRedirectWinsUntilItIsFlushed) {
  storeRedirect("p07-kyn.example.test");
  EXPECT_EQ(KYNBaseCmd().host(), "p07-kyn.example.test");
  EXPECT_EQ(KYNBaseCmd().host(), "p07-kyn.example.test");
  Common::sharedInstance().flushRedirection();
  EXPECT_EQ(KYNBaseCmd().host(), "kyn.example.test");
}

TEST_F(KYNBaseCmdTest, WithoutAccountOrRedirectTheHostStaysUnset) {
  systemInfo->signOut();
  Common::sharedInstance().clearKYNAccount();
  KYNBaseCmd command;
  EXPECT_FALSE(command.host());
  EXPECT_FALSE(command.username());
  EXPECT_FALSE(command.password());
  EXPECT_FALSE(command.url());
}

TEST_F(KYNBaseCmdTest, AddsTheTwoFixedHeadersInOrder) {
  const Value headers = KYNBaseCmd().headers();
  EXPECT_EQ(platform::toJson(headers), R"({"X-Zanto-Vorn-API-Ver":"4.0","X-Zanto-AuthScheme":"Forever"})");
}

TEST_F(KYNBaseCmdTest, TheBodyCarriesTheSharedClientContext) {
  const Value body = KYNBaseCmd().jsonBodyDictionary();
  ASSERT_TRUE(body.contains("clientContext"));
  EXPECT_EQ(body["clientContext"], KYNBaseCmd::staticClientContext());
  EXPECT_EQ(body.size(), 1u);
}

TEST_F(KYNBaseCmdTest, ClientContextHasTheDeviceFactsInOrder) {
  const Value context = KYNBaseCmd::makeClientContext();
  EXPECT_EQ(platform::toJson(context),
            R"({"deviceUDID":"0F8A2C4E-1B3D-4F5A-9C7E-2D4B6F8A0C1E","productType":"Test Desktop 1",)"
            R"("osVersion":"12.4","buildVersion":"6.1.0-test","locale":"en-US"})");
}

TEST_F(KYNBaseCmdTest, UnknownFactsAreLeftOutNotSentAsNull) {
  systemInfo->product.reset();
  assistant->setLanguageCode(std::nullopt);
  const Value context = KYNBaseCmd::makeClientContext();
  EXPECT_FALSE(context.contains("productType"));
  EXPECT_FALSE(context.contains("locale"));
  EXPECT_EQ(context.size(), 3u);
}

TEST_F(KYNBaseCmdTest, TheClientContextIsBuiltOnce) {
  const Value first = KYNBaseCmd().jsonBodyDictionary()["clientContext"];
  assistant->setLanguageCode("de-DE");
  systemInfo->udid = "changed";
  const Value second = KYNBaseCmd().jsonBodyDictionary()["clientContext"];
  EXPECT_EQ(first, second);
  EXPECT_EQ(&KYNBaseCmd::staticClientContext(), &KYNBaseCmd::staticClientContext());
}

TEST_F(KYNBaseCmdTest, EveryParseSetsTheStatusCodeAsItCame) {
  KYNBaseCmd command;
  EXPECT_FALSE(command.statusCode());
  command.setResponseBody(R"({"statusCode":200})");
  ASSERT_NE(command.jsonResponseDictionary(), nullptr);
  EXPECT_EQ(command.statusCode(), Value(200));
  command.setResponseBody(R"({"other":1})");
  (void)command.jsonResponseDictionary();
  EXPECT_FALSE(command.statusCode());  // cleared by a response without it
  command.setResponseBody(R"({"statusCode":"417"})");
  (void)command.jsonResponseDictionary();
  EXPECT_EQ(command.statusCode(), Value("417"));
  command.setResponseBody(R"({"statusCode":null})");
  (void)command.jsonResponseDictionary();
  EXPECT_FALSE(command.statusCode());
  command.setResponseBody("not json");
  EXPECT_EQ(command.jsonResponseDictionary(), nullptr);
  EXPECT_FALSE(command.statusCode());
  command.setResponseBody("[1,2]");
  EXPECT_EQ(command.jsonResponseDictionary(), nullptr);
}

TEST_F(KYNBaseCmdTest, MinimumCallbackIntervalIsInSeconds) {
  KYNBaseCmd command;
  EXPECT_EQ(command.minCallbackInterval(), 0.0);
  command.setResponseBody(R"({"serverContext":{"minCallbackIntervalInMS":5000}})");
  EXPECT_EQ(command.minCallbackInterval(), 5.0);
  command.setResponseBody(R"({"serverContext":{}})");
  EXPECT_EQ(command.minCallbackInterval(), 0.0);
  command.setResponseBody(R"({"serverContext":{"minCallbackIntervalInMS":"5000"}})");
  EXPECT_EQ(command.minCallbackInterval(), 0.0);
  command.setResponseBody(R"({"serverContext":"x"})");
  EXPECT_EQ(command.minCallbackInterval(), 0.0);
}

TEST_F(KYNBaseCmdTest, TheDescriptionNeverShowsTheToken) {
  KYNBaseCmd command;
  command.setTransferResult(false, platform::HTTPResponse{401});
  const std::string text = command.description();
  EXPECT_NE(text.find("https://kyn.example.test/"), std::string::npos);
  EXPECT_NE(text.find("401"), std::string::npos);
  EXPECT_EQ(text.find("secret-token-42"), std::string::npos);
}

}  // namespace
}  // namespace kyn
