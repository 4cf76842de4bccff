#include "commands/GetLocationsCmd.h"
#include "datasource/KYNAXDataSource.h"
#include "datasource/ReplyCallback.h"
#include "support/ControllerTest.h"

namespace kyn {
namespace {

class KYNAXDataSourceTest : public test::ControllerTest {
 protected:
  void SetUp() override {
    ControllerTest::SetUp();
    systemInfo->signIn();
  }

  /// Runs a search whose exchange ends with `response`; returns the reply and the command sent.
  std::pair<Value, std::shared_ptr<GetLocationsCmd>> searchEndingWith(const test::FakeResponse& response) {
    AXKynSearch search;
    search.proximity = "near";
    std::vector<Value> replies;
    const std::size_t before = controller->sent().size();
    KYNAXDataSource::dataSource().search(search, [&](const Value& reply) { replies.push_back(reply); });
    auto sent = controller->sent();
    EXPECT_EQ(sent.size(), before + 1);
    auto command = std::dynamic_pointer_cast<GetLocationsCmd>(sent.back());
    EXPECT_TRUE(replies.empty());  // nothing before the exchange ends
    test::completeCommand(command, response);
    EXPECT_EQ(replies.size(), 1u);
    EXPECT_FALSE(command->completionBlock()) << "the callback must break the cycle";
    return {replies.empty() ? Value() : replies.front(), command};
  }
};

TEST_F(KYNAXDataSourceTest, OneSharedInstanceWithAController) {
  EXPECT_EQ(&KYNAXDataSource::dataSource(), &KYNAXDataSource::dataSource());
  KYNAXDataSource fresh;
  EXPECT_TRUE(fresh.serverInteractionController());
}

TEST_F(KYNAXDataSourceTest, TheCommandIsFilledFromTheSearch) {
  AXKynSearch search;
  search.currentLocation = std::make_shared<AXLocation>();
  search.currentLocation->latitude = 45.5;
  search.currentLocation->longitude = -122.6;
  search.requestedLocation = std::make_shared<AXLocation>();
  search.requestedLocation->latitude = 45.6;
  search.requestedLocation->longitude = -122.7;
  search.requestedLocation->label = "Work";
  search.friends = std::vector{std::make_shared<AXPerson>()};
  search.proximity = "at";
  KYNAXDataSource::dataSource().search(search, [](const Value&) {});
  auto command = std::dynamic_pointer_cast<GetLocationsCmd>(controller->sent().at(0));
  ASSERT_TRUE(command);
  EXPECT_EQ(command->currentLocation->coordinate.latitude, 45.5);
  EXPECT_EQ(command->requestedLocation->coordinate.longitude, -122.7);
  EXPECT_EQ(command->requestedLocationLabel, "Work");
  EXPECT_EQ(command->friends->size(), 1u);
  EXPECT_EQ(command->proximity, "at");
  search.friends->clear();  // the command holds its own copy of the list
  EXPECT_EQ(command->friends->size(), 1u);
  test::completeCommand(command, {});
}

TEST_F(KYNAXDataSourceTest, ABodyWithoutStatusIsACompletedSearch) {
  auto [reply, command] = searchEndingWith({true, 200, R"({"locations":{"a@example.com":{"match":true}},
                                                          "serverContext":{"clientId":"c"}})"});
  EXPECT_EQ(reply["class"], "AXKynSearchCompleted");
  EXPECT_EQ(reply["kynLocations"].size(), 1u);
  EXPECT_EQ(reply["atRequestedLocation"], true);
  EXPECT_EQ(reply["searchContext"], "kynServerContext://serverContext?clientId=c&");
  EXPECT_TRUE(log->contains("Result: (<AXKynLocation"));
}

TEST_F(KYNAXDataSourceTest, BodyStatusesOfAFinishedTransfer) {
  EXPECT_EQ(searchEndingWith({true, 200, R"({"statusCode":417})"}).first["errorCode"], AXKynNoFriendsErrorCode);
  EXPECT_EQ(searchEndingWith({true, 200, R"({"statusCode":"411"})"}).first["errorCode"], AXKynNotAFriendErrorCode);
  EXPECT_EQ(searchEndingWith({true, 200, R"({"statusCode":416,"locations":{}})"}).first["class"], "AXKynSearchCompleted");
  EXPECT_EQ(searchEndingWith({true, 200, R"({"statusCode":500})"}).first["class"], "AXKynSearchCompleted");
  EXPECT_EQ(searchEndingWith({true, 200, "not json"}).first["class"], "AXKynSearchCompleted");
}

TEST_F(KYNAXDataSourceTest, AFailedTransferIsNotLoggedInOnlyFor401) {
  EXPECT_EQ(searchEndingWith({false, 401, "{}"}).first["errorCode"], AXKynNotLoggedInErrorCode);
  EXPECT_TRUE(log->contains("ERROR: Server HTTP Status: 401"));
  EXPECT_TRUE(log->contains("Error code response: 1001"));
  EXPECT_EQ(searchEndingWith({false, 500, R"({"statusCode":417})"}).first["errorCode"],
            AXKynServiceNotAvailableErrorCode);
  EXPECT_EQ(searchEndingWith({false, std::nullopt, ""}).first["errorCode"], AXKynServiceNotAvailableErrorCode);
  EXPECT_TRUE(log->contains("ERROR: Server HTTP Status: 0"));
}

TEST_F(KYNAXDataSourceTest, TheCycleIsBrokenEvenWhenTheAssistantsCompletionThrows) {
  AXKynSearch search;
  search.proximity = "near";
  KYNAXDataSource::dataSource().search(search, [](const Value&) { throw std::runtime_error("host failure"); });
  auto command = controller->sent().at(0);
  std::weak_ptr<platform::KYJSONCommand> weak = command;
  test::completeCommand(command, {});
  EXPECT_FALSE(command->completionBlock());
  EXPECT_TRUE(log->contains("host failure"));
  command.reset();
  controller = std::make_shared<test::FakeController>();
  KYNAXDataSource::dataSource().setServerInteractionController(controller);  // drops the sent list
  EXPECT_TRUE(weak.expired()) << "the command leaked";
}

TEST_F(KYNAXDataSourceTest, AReplyThatCannotBeMadeIsStillOneFailure) {
  auto command = std::make_shared<GetLocationsCmd>();
  std::vector<Value> replies;
  command->setCompletionBlock(replyCallback(command, [&](const Value& r) { replies.push_back(r); },
                                            [](GetLocationsCmd&) -> std::shared_ptr<AXObject> { throw std::bad_alloc(); }));
  test::completeCommand(command, {});
  ASSERT_EQ(replies.size(), 1u);
  EXPECT_EQ(replies[0]["errorCode"], AXKynServiceNotAvailableErrorCode);
  EXPECT_FALSE(command->completionBlock());
}

TEST_F(KYNAXDataSourceTest, WithoutAControllerTheSearchIsStillAnswered) {
  KYNAXDataSource::dataSource().setServerInteractionController(nullptr);
  AXKynSearch search;
  int replies = 0;
  Value last;
  KYNAXDataSource::dataSource().search(search, [&](const Value& r) {
    ++replies;
    last = r;
  });
  EXPECT_EQ(replies, 1);
  EXPECT_EQ(last["errorCode"], AXKynServiceNotAvailableErrorCode);
}

TEST_F(KYNAXDataSourceTest, MockDataIsReadByNoOneAndLoggedWhenHandedIn) {
  KYNAXDataSource source;
  source.loadMockLocationData();  // no resource ships
  EXPECT_FALSE(source.mockLocations());
  source.dataLoaded(Value::parse(R"({"k":1})"));
  EXPECT_TRUE(log->contains(R"(dataLoaded: {"k":1})"));
}

}  // namespace
}  // namespace kyn
