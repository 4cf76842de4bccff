#pragma once

#include "datasource/KYNAXDataSource.h"
#include "support/FakeContactStore.h"
#include "support/FakeController.h"
#include "support/PlatformTest.h"

namespace kyn::test {

/// A platform fixture whose data source sends through a fake controller, with an empty address book.
class ControllerTest : public PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    platform::services().contactStore.set(std::make_shared<FakeContactStore>());
    controller = std::make_shared<FakeController>();
    KYNAXDataSource::dataSource().setServerInteractionController(controller);
  }
  void TearDown() override {
    KYNAXDataSource::dataSource().setServerInteractionController(nullptr);
    PlatformTest::TearDown();
  }

  std::shared_ptr<FakeController> controller;
};

}  // namespace kyn::test
