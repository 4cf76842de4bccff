#pragma once

#include "support/FakeContactStore.h"
#include "support/FakeController.h"
#include "support/Fakes.h"

#include <gtest/gtest.h>

#include <memory>

namespace kyn::test {

/// Base fixture: a fresh configuration directory, every log line captured, a fixed clock in UTC,
/// en_US formats and locale, English as the assistant's language, a signed-in account, an empty
/// address book in memory, and the data source sending through a fake controller. The account
/// context's cached facts are cleared before and after. Restores the defaults afterwards.
class PlatformTest : public ::testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  /// Every message logged so far.
  [[nodiscard]] std::vector<std::string> logMessages() const { return log->messages(); }

  std::unique_ptr<TempDir> configDir = std::make_unique<TempDir>();
  std::shared_ptr<platform::CaptureLogSink> log = std::make_shared<platform::CaptureLogSink>();
  std::shared_ptr<FakeSystemInfo> systemInfo = std::make_shared<FakeSystemInfo>();
  std::shared_ptr<FakeSession> session = std::make_shared<FakeSession>();
  std::shared_ptr<FixedClock> clock = std::make_shared<FixedClock>(utcDate(2026, 11, 21, 15, 30, 0));
  std::shared_ptr<platform::AssistantPreferences> assistant = std::make_shared<platform::AssistantPreferences>("en-US");
  std::shared_ptr<FakeContactStore> addressBook = std::make_shared<FakeContactStore>();
  std::shared_ptr<FakeController> controller = std::make_shared<FakeController>();

 private:
  std::shared_ptr<platform::LogSink> previousSink_;
  platform::LogLevel previousLevel_ = platform::LogLevel::Info;
};

}  // namespace kyn::test
