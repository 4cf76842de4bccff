#include "commands/ShowHideLocationCmd.h"
#include "support/PlatformTest.h"
#include "utils/KYNAXUtils.h"

namespace kyn {
namespace {

using ShowHideLocationCmdTest = test::PlatformTest;

TEST_F(ShowHideLocationCmdTest, TheBodyIsTheClientContextAndTheOneFlag) {
  ShowHideLocationCmd command;
  command.hideLocation = true;
  // Compared as text, so that the order of the keys counts too.
  const Value expected = {{"clientContext", KYNBaseCmd::staticClientContext()}, {"prefs", {{"hideLocation", "Yes"}}}};
  EXPECT_EQ(command.jsonBodyDictionary().dump(), expected.dump());

  const auto here = test::fix(45.5, -122.6);
  command.currentLocation = std::make_shared<const platform::Location>(here);
  command.hideLocation = false;
  const Value body = command.jsonBodyDictionary();
  Value context = KYNBaseCmd::staticClientContext();
  context["location"] = *KYNAXUtils::dictionaryForLocation(here);
  EXPECT_EQ(body["clientContext"].dump(), context.dump());
  EXPECT_EQ(body["prefs"].dump(), R"({"hideLocation":"No"})");
}

TEST_F(ShowHideLocationCmdTest, TheResultIsTheResponseAndTheRecordAsRequested) {
  ShowHideLocationCmd command;
  command.hideLocation = true;
  command.setTransferResult(true, platform::HTTPResponse{200});
  const char* body = R"({"statusCode":200,"serverContext":{"a":1},
    "myInfo":{"preferredEmail":"sam@example.com","location":{"latitude":45.5,"longitude":-122.6,"labels":[{"label":"Home"}]}}})";
  command.setResponseBody(body);
  const auto result = command.result();
  ASSERT_TRUE(result);
  EXPECT_EQ(result->response().toValue(), Value::parse(body));
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL(*command.contextIdentifierURL()),
            Value::parse(R"({"a":1,"preferredEmail":"sam@example.com"})"));
  // Hidden, as asked, though the server still holds a place.
  EXPECT_FALSE(result->myLocation->isVisible);
  EXPECT_EQ(result->myLocation->friendHandle(), "sam@example.com");
  EXPECT_NE(result->myLocation->friendLocation(true), "Home");
}

}  // namespace
}  // namespace kyn
