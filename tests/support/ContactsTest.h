#pragma once

#include "support/FakeContactStore.h"
#include "support/PlatformTest.h"
#include "platform/locale/IcuLocaleInfo.h"

namespace kyn::test {

/// A platform fixture with an address book in memory and the user's locale set to en_US.
class ContactsTest : public PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    platform::services().locale.set(std::make_shared<platform::IcuLocaleInfo>("en_US"));
    store = std::make_shared<FakeContactStore>();
    platform::services().contactStore.set(store);
  }
  std::shared_ptr<FakeContactStore> store;
};

}  // namespace kyn::test
