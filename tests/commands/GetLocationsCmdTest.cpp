#include "commands/GetLocationsCmd.h"
#include "support/PlatformTest.h"
#include "utils/KYNAXUtils.h"

namespace kyn {
namespace {

class GetLocationsCmdTest : public test::PlatformTest {
 protected:
  static std::shared_ptr<GetLocationsCmd> answered(const char* body) {
    auto command = std::make_shared<GetLocationsCmd>();
    command->setTransferResult(true, platform::HTTPResponse{200});
    command->setResponseBody(body);
    return command;
  }
  static std::shared_ptr<const platform::Location> at(double lat, double lon) {
    return std::make_shared<const platform::Location>(test::fix(lat, lon, 65));
  }
  static std::vector<std::string> handlesOf(const AXArray<AXKynLocation>& list) {
    std::vector<std::string> out;
    for (const auto& l : *list) out.push_back(l->friend_->data.value_or(""));
    return out;
  }
};

TEST_F(GetLocationsCmdTest, TheBodyHoldsItsKeysInOrderAndOnlyThoseWithValues) {
  GetLocationsCmd command;
  EXPECT_EQ(command.jsonBodyDictionary().size(), 1u);  // clientContext alone
  command.friends = std::vector{test::makePerson({"ada@example.com"}, {"(503) 555-0101"}),
                                test::makePerson({}, {"+44 20 7946 0018"})};
  command.currentLocation = at(45.5, -122.6);
  command.requestedLocation = at(45.6, -122.7);
  command.requestedLocationLabel = "Home";
  command.proximity = "near";
  command.clientId = "client-7";
  command.emails = std::vector<std::string>{"never@example.com"};
  Value body = command.jsonBodyDictionary();
  EXPECT_EQ(command.jsonBody(), platform::toJson(body));  // the text sent is the dictionary's
  EXPECT_EQ(body["myLocation"], *KYNAXUtils::dictionaryForLocation(*command.currentLocation));
  EXPECT_EQ(body["requestedLocation"], *KYNAXUtils::dictionaryForLocation(*command.requestedLocation));
  body.erase("clientContext");
  body["myLocation"] = body["requestedLocation"] = 0;
  EXPECT_EQ(body, Value::parse(R"({"handles":["+15035550101","ada@example.com","+442079460018"],"myLocation":0,
      "requestedLocation":0,"label":"Home","proximity":"near","serverContext":{"clientId":"client-7"}})"));
}

TEST_F(GetLocationsCmdTest, EmptyFriendsSendAnEmptyListAndInvalidPlacesNothing) {
  GetLocationsCmd command;
  command.friends.emplace();
  command.requestedLocation = at(95.0, 0.0);
  const Value body = command.jsonBodyDictionary();
  EXPECT_EQ(body["handles"], Value::array());
  EXPECT_FALSE(body.contains("requestedLocation"));
  command.friends.reset();
  EXPECT_FALSE(command.allFriendsHandles());
}

TEST_F(GetLocationsCmdTest, FriendsAreFoundByTheirHandleAsWrittenOnly) {
  GetLocationsCmd command;
  const auto ada = test::makePerson({"ada@example.com"}, {"(503) 555-0101"});
  const auto grace = test::makePerson({"grace@example.com"}, {"+15035550102", "ada@example.com"});
  command.friends = std::vector{ada, grace};
  EXPECT_EQ(command.friendForHandle("ada@example.com"), ada);
  EXPECT_EQ(command.friendForHandle("+15035550102"), grace);
  EXPECT_EQ(command.friendForHandle("(503) 555-0101"), ada);
  EXPECT_EQ(command.friendForHandle("+15035550101"), nullptr);  // the completed form is not how Ada holds it
  EXPECT_EQ(command.friendForHandle("ADA@example.com"), nullptr);
}

TEST_F(GetLocationsCmdTest, AnIncompleteAnswerMarksItsContext) {
  // Of a repeated key the last value counts, at the first one's place; the mark replaces the server's.
  auto command = answered(R"({"statusCode":416,"serverContext":{"a":1,"incomplete":0,"b":"x","a":2},"locations":{}})");
  ASSERT_TRUE(command->result());
  EXPECT_EQ(command->contextIdentifierURL(), "kynServerContext://serverContext?a=2&incomplete=1&b=x&");
  auto complete = answered(R"({"statusCode":200,"serverContext":{"a":1}})");
  (void)complete->result();
  EXPECT_EQ(complete->contextIdentifierURL(), "kynServerContext://serverContext?a=1&");
  auto noContext = answered(R"({"statusCode":"416","locations":{}})");
  ASSERT_TRUE(noContext->result());
  EXPECT_FALSE(noContext->contextIdentifierURL());
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
}

TEST_F(GetLocationsCmdTest, TheEmailsListDecidesWhichHandlesAreReportedElseEveryLocationInDocumentOrder) {
  auto command = answered(R"({"emails":["ghost@example.com","b@example.com"],
    "locations":{"a@example.com":{"location":{"latitude":1,"longitude":2}},"b@example.com":{"match":true}}})");
  const auto list = command->result();
  EXPECT_EQ(handlesOf(list), (std::vector<std::string>{"ghost@example.com", "b@example.com"}));
  EXPECT_FALSE(list->at(0)->latitude);  // built from no entry, not skipped
  EXPECT_EQ(command->atRequestedLocation, true);
  auto all = answered(R"({"emails":[],"locations":{"z@example.com":{},"a@example.com":{},"+15035550101":{}}})");
  EXPECT_EQ(handlesOf(all->result()), (std::vector<std::string>{"z@example.com", "a@example.com", "+15035550101"}));
}

TEST_F(GetLocationsCmdTest, NotAFriendIsLeftOutAndTheLastMatchWins) {
  auto command = answered(R"({"locations":{"a@example.com":{"match":true},"b@example.com":{"match":false},
                                           "c@example.com":{"status":411,"match":true}}})");
  EXPECT_EQ(handlesOf(command->result()), (std::vector<std::string>{"a@example.com", "b@example.com"}));
  EXPECT_EQ(command->atRequestedLocation, false);  // b's, since c was skipped
  EXPECT_TRUE(answered(R"({"locations":{"a@example.com":{"status":"411"}}})")->result()->empty());
  auto unmatched = answered(R"({"locations":{"a@example.com":{"match":true},"b@example.com":{}}})");
  ASSERT_TRUE(unmatched->result());
  EXPECT_EQ(unmatched->atRequestedLocation, false);  // an entry without "match" is not at the place
}

TEST_F(GetLocationsCmdTest, TheAssistantsOwnPersonIsUsedForItsHandle) {
  auto command = answered(R"({"locations":{"ada@example.com":{},"(503) 555-0101":{},"+15035550101":{}}})");
  const auto ada = test::makePerson({"ada@example.com"}, {"(503) 555-0101"}, "Ada Lovelace");
  const auto other = test::makePerson({"ada@example.com"}, {}, "Someone Later");
  command->friends = std::vector{ada, other};
  const auto list = command->result();
  ASSERT_EQ(list->size(), 3u);
  EXPECT_EQ(list->at(0)->friend_->object, ada);  // the first friend holding the handle
  EXPECT_EQ(list->at(1)->friend_->object, ada);
  EXPECT_FALSE(list->at(2)->friend_->object->fullName);  // a server key in another form finds no friend
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
