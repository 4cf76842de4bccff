#include "commands/SetGeoFenceCmd.h"
#include "datasource/KYNAXDataSource.h"
#include "support/FakeContactStore.h"
#include "support/FakeController.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using platform::services;

class GeoFenceDispatchTest : public test::PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    services().contactStore.set(std::make_shared<test::FakeContactStore>());
    systemInfo->signIn();
    KYNAXDataSource::dataSource().setServerInteractionController(controller);
  }
  void TearDown() override {
    KYNAXDataSource::dataSource().setServerInteractionController(nullptr);
    PlatformTest::TearDown();
  }
  std::shared_ptr<test::FakeController> controller = std::make_shared<test::FakeController>();
};

// The body's code alone decides, tested in the order of the mapping; a failed transfer changes nothing.
TEST_F(GeoFenceDispatchTest, TheBodysCodeDecidesTheReply) {
  struct Row {
    test::FakeResponse response;
    std::optional<std::int64_t> errorCode;  // nothing: the fence was set
  };
  const Row rows[] = {
      {{true, 200, R"({"statusCode":542})"}, AXKynGeoFenceNotCreatedErrorCode},
      {{true, 200, R"({"statusCode":545})"}, AXKynServiceNotAvailableErrorCode},
      {{true, 200, R"({"statusCode":299,"fence":{"latitude":45.5}})"}, std::nullopt},
      {{true, 200, R"({"statusCode":300})"}, AXKynServiceNotAvailableErrorCode},
      {{true, 200, R"({"statusCode":535})"}, AXKynAddressNotFoundErrorCode},
      {{false, 500, R"({"statusCode":200})"}, std::nullopt},
  };
  AXKynGeoFenceSet assistantCommand;
  assistantCommand.friend_ = test::makePerson({"ada@example.com"}, {});
  assistantCommand.requestedLocation = std::make_shared<AXLocation>();
  assistantCommand.requestedLocation->label = "Work";
  assistantCommand.geoFenceTrigger = std::string(AXKynGeoFenceTriggerOnDepartureValue);
  assistantCommand.oneTimeOnly = true;
  assistantCommand.fenceType = std::string(AXKynFenceTypeNotifyMeValue);
  for (const auto& row : rows) {
    std::vector<Value> replies;
    KYNAXDataSource::dataSource().setGeoFence(assistantCommand, [&](const Value& r) { replies.push_back(r); });
    auto command = std::dynamic_pointer_cast<SetGeoFenceCmd>(controller->sent().back());
    ASSERT_TRUE(command);
    ASSERT_TRUE(replies.empty());
    test::completeCommand(command, row.response);
    ASSERT_EQ(replies.size(), 1u) << row.response.body;
    EXPECT_FALSE(command->completionBlock()) << "the callback must break the cycle";
    if (row.errorCode) {
      EXPECT_EQ(replies[0], (Value{{"class", "AXCommandFailed"}, {"errorCode", *row.errorCode}})) << row.response.body;
    } else {
      EXPECT_EQ(replies[0]["class"], "AXKynGeoFenceSetCompleted") << row.response.body;
      EXPECT_EQ(replies[0]["geoFence"]["trigger"], "OnDeparture");
      EXPECT_EQ(replies[0]["geoFence"]["location"]["label"], "Work");
    }
    // Filled from the assistant's command; an absent `enable` is off.
    EXPECT_EQ(command->axPerson, assistantCommand.friend_);
    EXPECT_NE(command->location(), assistantCommand.requestedLocation) << "the place is copied";
    EXPECT_EQ(command->location()->label, "Work");
    EXPECT_TRUE(command->onetimeonly);
    EXPECT_FALSE(command->enable);
    EXPECT_EQ(command->fenceType, "Me");
  }
  EXPECT_TRUE(log->contains("Server HTTP Status: 542"));
  EXPECT_EQ(controller->sent().size(), std::size(rows));
}

}  // namespace
}  // namespace kyn
