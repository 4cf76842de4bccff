#include "support/PlatformTest.h"

#include "account/Common.h"
#include "datasource/KYNAXDataSource.h"
#include "platform/locale/IcuLocaleInfo.h"
#include "platform/localization/IcuLocalization.h"
#include "platform/time/IcuDateFormatting.h"
#include "platform/time/SystemTime.h"

namespace kyn::test {

void PlatformTest::SetUp() {
  auto& s = platform::services();
  s.configure(configDir->path());

  previousSink_ = s.log().setSink(log);
  previousLevel_ = s.log().minimumLevel();
  s.log().setMinimumLevel(platform::LogLevel::Debug);

  systemInfo->signIn();
  s.systemInfo.set(systemInfo);
  s.session.set(session);
  s.clock.set(clock);
  s.calendar.set(std::make_shared<platform::IcuCalendar>("UTC"));
  s.numberFormatting.set(std::make_shared<platform::IcuNumberFormatting>("en_US"));
  s.dateFormatting.set(std::make_shared<platform::IcuDateFormatting>("en_US", "UTC"));
  s.assistantPreferences.set(assistant);
  s.locale.set(std::make_shared<platform::IcuLocaleInfo>("en_US"));
  s.contactStore.set(addressBook);
  KYNAXDataSource::dataSource().setServerInteractionController(controller);

  Common::sharedInstance().clearKYNAccount();
  systemInfo->accountReads = 0;  // creating the shared instance read the account once
}

void PlatformTest::TearDown() {
  auto& s = platform::services();
  KYNAXDataSource::dataSource().setServerInteractionController(nullptr);
  Common::sharedInstance().clearKYNAccount();
  s.log().setSink(previousSink_);
  s.log().setMinimumLevel(previousLevel_);
  s.configure(configDir->path());  // drops every fake
  configDir.reset();
}

}  // namespace kyn::test
