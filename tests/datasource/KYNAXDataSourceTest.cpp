#include "commands/GetLocationsCmd.h"
#include "commands/SetGeoFenceCmd.h"
#include "commands/ShowHideLocationCmd.h"
#include "datasource/KYNAXDataSource.h"
#include "datasource/ReplyCallback.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using Send = std::function<void(AXCompletion)>;

class KYNAXDataSourceTest : public test::PlatformTest {
 protected:
  /// Sends with `send`, ends the exchange with `response`; returns the one reply and the command.
  template <class Command>
  std::pair<Value, std::shared_ptr<Command>> exchange(const Send& send, const test::FakeResponse& response) {
    std::vector<Value> replies;
    send([&](const Value& reply) { replies.push_back(reply); });
    auto command = std::dynamic_pointer_cast<Command>(controller->sent().back());
    EXPECT_TRUE(command && replies.empty());  // nothing before the exchange ends
    test::completeCommand(command, response);
    EXPECT_EQ(replies.size(), 1u);
    EXPECT_FALSE(command->completionBlock()) << "the callback must break the cycle";
    return {replies.empty() ? Value() : replies.front(), command};
  }

  Send search = [](AXCompletion c) { KYNAXDataSource::dataSource().search(AXKynSearch{}, std::move(c)); };
  Send visibility = [](AXCompletion c) {
    AXKynVisibilityStateSet command;
    command.visible = true;
    KYNAXDataSource::dataSource().setVisibility(command, std::move(c));
  };
  Send geoFence = [](AXCompletion c) {
    AXKynGeoFenceSet command;
    command.friend_ = test::makePerson({"ada@example.com"}, {});
    KYNAXDataSource::dataSource().setGeoFence(command, std::move(c));
  };
};

// The three mappings deliberately differ. A row names the error code of each, or 0 for completed.
TEST_F(KYNAXDataSourceTest, EachOutcomeMapsToOneReplyPerCommand) {
  constexpr std::int64_t kDone = 0, kNotAvailable = AXKynServiceNotAvailableErrorCode;
  constexpr std::int64_t kNotCreated = AXKynGeoFenceNotCreatedErrorCode;
  const struct {
    test::FakeResponse response;
    std::int64_t search, visibility, geoFence;
  } rows[] = {
      {{false, 401, R"({"statusCode":200})"}, AXKynNotLoggedInErrorCode, kNotAvailable, kDone},
      {{false, 500, R"({"statusCode":417})"}, kNotAvailable, kNotAvailable, AXKynNoFriendsErrorCode},
      {{false, std::nullopt, ""}, kNotAvailable, kNotAvailable, kNotAvailable},
      {{true, 200, R"({"statusCode":411})"}, AXKynNotAFriendErrorCode, kDone, AXKynNotAFriendErrorCode},
      {{true, 200, R"({"statusCode":"417"})"}, AXKynNoFriendsErrorCode, kDone, AXKynNoFriendsErrorCode},
      {{true, 200, R"({"statusCode":200})"}, kDone, kDone, kDone},
      {{true, 200, R"({"locations":{}})"}, kDone, kNotAvailable, kNotAvailable},
      {{true, 200, R"({"statusCode":0})"}, kDone, kNotAvailable, kNotAvailable},
      {{true, 200, R"({"statusCode":-1})"}, kDone, kNotAvailable, kNotAvailable},
      {{true, 200, "<html>"}, kDone, kNotAvailable, kNotAvailable},
      {{true, 200, R"({"statusCode":401})"}, kDone, kDone, AXKynNotLoggedInErrorCode},
      {{true, 200, R"({"statusCode":416})"}, kDone, kDone, kNotAvailable},
      {{true, 200, R"({"statusCode":500})"}, kDone, kDone, kNotCreated},
      {{true, 200, R"({"statusCode":521})"}, kDone, kDone, AXKynLabelNotFoundErrorCode},
      {{true, 200, R"({"statusCode":535})"}, kDone, kDone, AXKynAddressNotFoundErrorCode},
      {{true, 200, R"({"statusCode":540})"}, kDone, kDone, kNotAvailable},
      {{true, 200, R"({"statusCode":541})"}, kDone, kDone, kNotCreated},
      {{true, 200, R"({"statusCode":544})"}, kDone, kDone, kNotCreated},
      {{true, 200, R"({"statusCode":545})"}, kDone, kDone, kNotAvailable},
      {{true, 200, R"({"statusCode":199})"}, kDone, kDone, kNotAvailable},
      {{true, 200, R"({"statusCode":299})"}, kDone, kDone, kDone},
      {{true, 200, R"({"statusCode":300})"}, kDone, kDone, kNotAvailable},
  };
  const std::pair<const char*, std::string> completed[] = {
      {"search", "AXKynSearchCompleted"}, {"visibility", "AXKynVisibilitySetCompleted"}, {"geofence", "AXKynGeoFenceSetCompleted"}};
  for (const auto& row : rows) {
    const std::int64_t expected[] = {row.search, row.visibility, row.geoFence};
    const Value replies[] = {exchange<GetLocationsCmd>(search, row.response).first,
                             exchange<ShowHideLocationCmd>(visibility, row.response).first,
                             exchange<SetGeoFenceCmd>(geoFence, row.response).first};
    for (int i = 0; i < 3; ++i) {
      SCOPED_TRACE(std::string(completed[i].first) + " " + row.response.body + " " +
                   std::to_string(row.response.http.value_or(0)));
      if (expected[i] == kDone) {
        EXPECT_EQ(replies[i]["class"], completed[i].second);
      } else {
        EXPECT_EQ(replies[i], (Value{{"class", "AXCommandFailed"}, {"errorCode", expected[i]}}));
      }
    }
  }
}

TEST_F(KYNAXDataSourceTest, ACompletedReplyCarriesTheResultAndTheContext) {
  const Value found = exchange<GetLocationsCmd>(
      search, {true, 200, R"({"locations":{"a@example.com":{"match":true}},"serverContext":{"clientId":"c"}})"}).first;
  EXPECT_EQ(found["kynLocations"].size(), 1u);
  EXPECT_EQ(found["atRequestedLocation"], true);
  EXPECT_EQ(found["searchContext"], "kynServerContext://serverContext?clientId=c&");
  log->clear();
  const auto shown = exchange<ShowHideLocationCmd>(visibility, {true, 200, R"({"statusCode":500,"serverContext":{"c":"1"}})"});
  EXPECT_TRUE(log->contains("Result: "));
  EXPECT_EQ(shown.first, Value::parse(R"({"class":"AXKynVisibilitySetCompleted",
                                          "searchContext":"kynServerContext://serverContext?c=1&"})"));
  const auto fence = exchange<SetGeoFenceCmd>(geoFence, {true, 200, R"({"statusCode":200,"serverContext":{"c":"2"},
                                                                        "fence":{"latitude":45.5}})"});
  EXPECT_EQ(fence.first["searchContext"], "kynServerContext://serverContext?c=2&");
  EXPECT_EQ(fence.first["geoFence"]["location"]["latitude"], 45.5);
}

TEST_F(KYNAXDataSourceTest, TheServerCommandsAreFilledFromTheAssistantsCommands) {
  AXKynSearch find = *AXKynSearch::fromDictionary(Value::parse(R"({"friends":[{}],"proximity":"at",
      "currentLocation":{"latitude":45.5,"longitude":-122.6},
      "requestedLocation":{"latitude":45.6,"longitude":-122.7,"label":"Work"}})"));
  KYNAXDataSource::dataSource().search(find, [](const Value&) {});
  auto located = std::dynamic_pointer_cast<GetLocationsCmd>(controller->sent().back());
  EXPECT_EQ(located->currentLocation->coordinate.latitude, 45.5);
  EXPECT_EQ(located->requestedLocation->coordinate.longitude, -122.7);
  EXPECT_EQ(located->requestedLocationLabel, "Work");
  EXPECT_EQ(located->proximity, "at");
  find.friends->clear();  // the command holds its own copy of the list
  EXPECT_EQ(located->friends->size(), 1u);

  AXKynGeoFenceSet fence = *AXKynGeoFenceSet::fromDictionary(Value::parse(R"({"requestedLocation":{"label":"Work"},
      "friend":{"emails":[{"emailAddress":"ada@example.com"}]},"geoFenceTrigger":"OnDeparture","oneTimeOnly":true,
      "fenceType":"Me"})"));
  KYNAXDataSource::dataSource().setGeoFence(fence, [](const Value&) {});
  auto set = std::dynamic_pointer_cast<SetGeoFenceCmd>(controller->sent().back());
  EXPECT_EQ(set->axPerson, fence.friend_);
  EXPECT_NE(set->location(), fence.requestedLocation) << "the place is copied";
  EXPECT_EQ(set->location()->label, "Work");
  EXPECT_EQ(set->trigger, AXKynGeoFenceTriggerOnDepartureValue);
  EXPECT_TRUE(set->onetimeonly);
  EXPECT_FALSE(set->enable);  // absent is off
  EXPECT_EQ(set->fenceType, AXKynFenceTypeNotifyMeValue);
  fence.enable = true;
  fence.oneTimeOnly.reset();
  KYNAXDataSource::dataSource().setGeoFence(fence, [](const Value&) {});
  const auto again = std::dynamic_pointer_cast<SetGeoFenceCmd>(controller->sent().back());
  EXPECT_TRUE(again->enable);
  EXPECT_FALSE(again->onetimeonly);  // absent is a fence that stays
  for (const auto& command : controller->sent()) test::completeCommand(command, {});
}

TEST_F(KYNAXDataSourceTest, TheCycleIsBrokenEvenWhenTheAssistantsCompletionThrows) {
  KYNAXDataSource::dataSource().search(AXKynSearch{}, [](const Value&) { throw std::runtime_error("host failure"); });
  auto command = controller->sent().at(0);
  std::weak_ptr<platform::KYJSONCommand> weak = command;
  test::completeCommand(command, {});
  EXPECT_FALSE(command->completionBlock());
  EXPECT_TRUE(log->contains("host failure"));
  command.reset();
  KYNAXDataSource::dataSource().setServerInteractionController(nullptr);  // drops the sent list
  controller.reset();
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

TEST_F(KYNAXDataSourceTest, WithoutAControllerEveryCommandIsStillAnswered) {
  EXPECT_TRUE(KYNAXDataSource().serverInteractionController());  // a new source makes its own
  KYNAXDataSource::dataSource().setServerInteractionController(nullptr);
  std::vector<Value> replies;
  const AXCompletion keep = [&](const Value& r) { replies.push_back(r); };
  search(keep);
  visibility(keep);
  geoFence(keep);
  ASSERT_EQ(replies.size(), 3u);
  for (const auto& reply : replies) EXPECT_EQ(reply["errorCode"], AXKynServiceNotAvailableErrorCode);
}

}  // namespace
}  // namespace kyn
