#include "commands/GetLocationsCmd.h"
#include "platform/value/Json.h"
#include "support/ContactsTest.h"
#include "utils/KYNAXUtils.h"

namespace kyn {
namespace {

using platform::services;

class GetLocationsCmdTest : public test::ContactsTest {
 protected:
  void SetUp() override {
    ContactsTest::SetUp();
    systemInfo->signIn();
  }
  static std::shared_ptr<GetLocationsCmd> answered(const char* body) {
    auto command = std::make_shared<GetLocationsCmd>();
    command->setTransferResult(true, platform::HTTPResponse{200});
    command->setResponseBody(body);
    return command;
  }
  static platform::Location at(double lat, double lon) {
    platform::Location l;
    l.coordinate = {lat, lon};
    l.horizontalAccuracy = 65;
    return l;
  }
};

TEST_F(GetLocationsCmdTest, PathAndHeaders) {
  GetLocationsCmd command;
  EXPECT_EQ(command.path(), "/kytrservice/friends/va/getlocations");
  EXPECT_EQ(command.url(), "https://kyn.example.test/kytrservice/friends/va/getlocations");
  EXPECT_EQ(command.headers(), KYNBaseCmd().headers());
}

TEST_F(GetLocationsCmdTest, TheBodyHoldsItsKeysInOrderAndOnlyThoseWithValues) {
  GetLocationsCmd command;
  EXPECT_EQ(command.jsonBodyDictionary().size(), 1u);  // clientContext alone
  command.friends = std::vector{test::makePerson({"ada@example.com"}, {"(503) 555-0101"}), test::makePerson({}, {"+44 20 7946 0018"})};
  command.currentLocation = std::make_shared<const platform::Location>(at(45.5, -122.6));
  command.requestedLocation = std::make_shared<const platform::Location>(at(45.6, -122.7));
  command.requestedLocationLabel = "Home";
  command.proximity = "near";
  command.clientId = "client-7";
  command.emails = std::vector<std::string>{"never@example.com"};
  const Value body = command.jsonBodyDictionary();
  std::vector<std::string> keys;
  for (const auto& [k, _] : body.items()) keys.push_back(k);
  EXPECT_EQ(keys, (std::vector<std::string>{"clientContext", "handles", "myLocation", "requestedLocation", "label",
                                            "proximity", "serverContext"}));
  EXPECT_EQ(body["handles"], Value::parse(R"(["+15035550101","ada@example.com","+442079460018"])"));
  EXPECT_EQ(body["myLocation"]["latitude"], 45.5);
  EXPECT_EQ(body["requestedLocation"]["source"], "assistant");
  EXPECT_EQ(body["serverContext"], Value::parse(R"({"clientId":"client-7"})"));
  EXPECT_EQ(platform::toJson(body).find("never@example.com"), std::string::npos);
}

TEST_F(GetLocationsCmdTest, EmptyFriendsSendAnEmptyListAndInvalidPlacesNothing) {
  GetLocationsCmd command;
  command.friends.emplace();
  command.requestedLocation = std::make_shared<const platform::Location>(at(95.0, 0.0));
  const Value body = command.jsonBodyDictionary();
  EXPECT_EQ(body["handles"], Value::array());
  EXPECT_FALSE(body.contains("requestedLocation"));
  EXPECT_FALSE(command.allFriendsHandles() == std::nullopt);
  command.friends.reset();
  EXPECT_FALSE(command.allFriendsHandles());
}

TEST_F(GetLocationsCmdTest, FriendsAreFoundByTheirHandleAsWrittenOnly) {
  GetLocationsCmd command;
  const auto ada = test::makePerson({"ada@example.com"}, {"(503) 555-0101"});
  const auto grace = test::makePerson({"grace@example.com"}, {"+15035550102"});
  command.friends = std::vector{ada, grace};
  EXPECT_EQ(command.friendForHandle("ada@example.com"), ada);
  EXPECT_EQ(command.friendForHandle("+15035550102"), grace);
  EXPECT_EQ(command.friendForHandle("(503) 555-0101"), ada);
  EXPECT_EQ(command.friendForHandle("+15035550101"), nullptr);  // the completed form is not how Ada holds it
  EXPECT_EQ(command.friendForHandle("ADA@example.com"), nullptr);
}

TEST_F(GetLocationsCmdTest, AnIncompleteAnswerMarksItsContext) {
  auto command = answered(R"({"statusCode":416,"serverContext":{"a":1},"locations":{}})");
  ASSERT_TRUE(command->result());
  EXPECT_EQ(KYNAXUtils::contextDictionaryForURL(*command->contextIdentifierURL()), Value::parse(R"({"a":1,"incomplete":1})"));
  auto noContext = answered(R"({"statusCode":"416","locations":{}})");
  ASSERT_TRUE(noContext->result());
  EXPECT_FALSE(noContext->contextIdentifierURL());
  EXPECT_TRUE(log->contains("serverContextDictionary: (null)"));
}

TEST_F(GetLocationsCmdTest, TheTokenOfTheServerContextStaysOutOfTheURL) {
  auto command = answered(R"({"serverContext":{"authToken":"secret","clientId":"c"},"locations":{}})");
  (void)command->result();
  EXPECT_EQ(command->contextIdentifierURL(), "kynServerContext://serverContext?clientId=c&");
}

TEST_F(GetLocationsCmdTest, NullLocationsGiveAnEmptyListAndNoResponseGivesNothing) {
  auto nullLocations = answered(R"({"locations":null})");
  const auto list = nullLocations->result();
  ASSERT_TRUE(list);
  EXPECT_TRUE(list->empty());
  EXPECT_EQ(nullLocations->atRequestedLocation, std::nullopt);

  auto noResponse = std::make_shared<GetLocationsCmd>();
  noResponse->setTransferResult(false, std::nullopt);
  EXPECT_FALSE(noResponse->result());
  EXPECT_FALSE(noResponse->contextIdentifierURL());
  EXPECT_TRUE(log->contains("getlocations_resultDictionary_raw: (null)"));
}

TEST_F(GetLocationsCmdTest, TheEmailsListDecidesWhichHandlesAreReported) {
  auto command = answered(R"({"emails":["ghost@example.com","b@example.com"],
    "locations":{"a@example.com":{"location":{"latitude":1,"longitude":2}},"b@example.com":{"match":true}}})");
  const auto list = command->result();
  ASSERT_EQ(list->size(), 2u);
  EXPECT_EQ(list->at(0)->friend_->data, "ghost@example.com");  // built from no entry, not skipped
  EXPECT_FALSE(list->at(0)->latitude);
  EXPECT_EQ(list->at(1)->friend_->data, "b@example.com");
  EXPECT_EQ(command->atRequestedLocation, true);
}

TEST_F(GetLocationsCmdTest, WithoutAnEmailsListEveryLocationIsReportedInDocumentOrder) {
  auto command = answered(R"({"emails":[],"locations":{"z@example.com":{},"a@example.com":{},"+15035550101":{}}})");
  const auto list = command->result();
  ASSERT_EQ(list->size(), 3u);
  EXPECT_EQ(list->at(0)->friend_->data, "z@example.com");
  EXPECT_EQ(list->at(2)->friend_->data, "+15035550101");
}

TEST_F(GetLocationsCmdTest, NotAFriendIsLeftOutAndTheLastMatchWins) {
  auto command = answered(R"({"locations":{"a@example.com":{"match":true},"b@example.com":{"match":false},
                                           "c@example.com":{"status":411,"match":true}}})");
  const auto list = command->result();
  ASSERT_EQ(list->size(), 2u);
  EXPECT_EQ(command->atRequestedLocation, false);  // b's, since c was skipped
  auto statusAsText = answered(R"({"locations":{"a@example.com":{"status":"411"}}})");
  EXPECT_TRUE(statusAsText->result()->empty());
}

TEST_F(GetLocationsCmdTest, TheAssistantsOwnPersonIsUsedForItsHandle) {
  auto command = answered(R"({"locations":{"ada@example.com":{},"(503) 555-0101":{},"+15035550101":{}}})");
  const auto ada = test::makePerson({"ada@example.com"}, {"(503) 555-0101"});
  ada->fullName = "Ada Lovelace";
  command->friends = std::vector{ada};
  const auto list = command->result();
  ASSERT_EQ(list->size(), 3u);
  EXPECT_EQ(list->at(0)->friend_->object, ada);
  EXPECT_EQ(list->at(1)->friend_->object, ada);
  EXPECT_NE(list->at(2)->friend_->object, ada);  // a server key in another form finds no friend
  EXPECT_FALSE(list->at(2)->friend_->object->fullName);
}

TEST_F(GetLocationsCmdTest, ValuesOfTheWrongTypeAreIgnored) {
  for (const char* body : {R"({"locations":[1,2],"emails":"a@example.com"})", R"({"locations":{"a":7},"emails":[3,null]})",
                           R"({"locations":"x","serverContext":[1]})"}) {
    auto command = answered(body);
    const auto list = command->result();
    ASSERT_TRUE(list) << body;
    EXPECT_LE(list->size(), 1u) << body;
    EXPECT_FALSE(command->contextIdentifierURL()) << body;
  }
}

}  // namespace
}  // namespace kyn
