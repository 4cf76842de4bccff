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

  std::unique_ptr<TempDir> configDir;
  std::shared_ptr<platform::CaptureLogSink> log;
  std::shared_ptr<FakeSystemInfo> systemInfo;
  std::shared_ptr<FakeSession> session;
  std::shared_ptr<FixedClock> clock;
  std::shared_ptr<platform::AssistantPreferences> assistant;
  std::shared_ptr<FakeContactStore> addressBook;
  std::shared_ptr<FakeController> controller;

 private:
  std::shared_ptr<platform::LogSink> previousSink_;
  platform::LogLevel previousLevel_ = platform::LogLevel::Info;
};

}  // namespace kyn::test
