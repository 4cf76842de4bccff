#include "account/Common.h"
#include "commands/KYNBaseCmd.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

class KYNBaseCmdTest : public test::PlatformTest {};

TEST_F(KYNBaseCmdTest, TakesSchemeCredentialsAndHostFromTheAccountUnlessARedirectIsStored) {
  KYNBaseCmd command;
  EXPECT_EQ(command.url(), "https://kyn.example.test/");
  EXPECT_EQ(command.username(), "P-1001");
  EXPECT_EQ(command.password(), "secret-token-42");
  test::postRedirect("kyn.example.test", "p07-kyn.example.test");
  EXPECT_EQ(KYNBaseCmd().host(), "p07-kyn.example.test");
  Common::sharedInstance().flushRedirection();
  EXPECT_EQ(KYNBaseCmd().host(), "kyn.example.test");

  systemInfo->signOut();
  Common::sharedInstance().clearKYNAccount();
  KYNBaseCmd nobody;
  EXPECT_FALSE(nobody.host() || nobody.username() || nobody.password() || nobody.url());
}

TEST_F(KYNBaseCmdTest, TheTwoFixedHeadersAndTheSharedClientContextBuiltOnce) {
  EXPECT_EQ(platform::toJson(KYNBaseCmd().headers()), R"({"X-Zanto-Vorn-API-Ver":"4.0","X-Zanto-AuthScheme":"Forever"})");
  const Value body = KYNBaseCmd().jsonBodyDictionary();
  EXPECT_EQ(body, (Value{{"clientContext", KYNBaseCmd::staticClientContext()}}));
  EXPECT_EQ(platform::toJson(KYNBaseCmd::makeClientContext()),
            R"({"deviceUDID":"0F8A2C4E-1B3D-4F5A-9C7E-2D4B6F8A0C1E","productType":"Test Desktop 1",)"
            R"("osVersion":"12.4","buildVersion":"6.1.0-test","locale":"en-US"})");
  systemInfo->product.reset();
  assistant->setLanguageCode(std::nullopt);
  EXPECT_EQ(platform::toJson(KYNBaseCmd::makeClientContext()),  // unknown facts are left out, not sent as null
            R"({"deviceUDID":"0F8A2C4E-1B3D-4F5A-9C7E-2D4B6F8A0C1E","osVersion":"12.4","buildVersion":"6.1.0-test"})");
  EXPECT_EQ(KYNBaseCmd().jsonBodyDictionary(), body);  // the commands' context stays as first built
}

TEST_F(KYNBaseCmdTest, EveryParseSetsTheStatusCodeAsItCame) {
  KYNBaseCmd command;
  EXPECT_FALSE(command.statusCodeValue());
  const std::pair<const char*, std::optional<Value>> bodies[] = {
      {R"({"statusCode":200})", Value(200)}, {R"({"other":1})", std::nullopt},  // cleared by a response without it
      {R"({"statusCode":"417"})", Value("417")}, {R"({"statusCode":null})", std::nullopt},
      {"not json", std::nullopt}, {"[1,2]", std::nullopt}};
  for (const auto& [body, status] : bodies) {
    command.setResponseBody(body);
    EXPECT_EQ(static_cast<bool>(command.jsonResponse()), body[0] == '{') << body;
    const auto code = command.statusCodeValue();
    EXPECT_EQ(code ? std::optional(code.toValue()) : std::nullopt, status) << body;
  }
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
