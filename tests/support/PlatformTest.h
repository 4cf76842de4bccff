#pragma once

#include "support/Fakes.h"

#include <gtest/gtest.h>

#include <memory>

namespace kyn::test {

/// Base fixture: a fresh configuration directory, every log line captured, a fixed clock in a fixed
/// time zone, fake account and device facts, English as the assistant's language, and the account
/// context's cached facts cleared. Restores the defaults afterwards.
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

 private:
  std::shared_ptr<platform::LogSink> previousSink_;
  platform::LogLevel previousLevel_ = platform::LogLevel::Info;
};

}  // namespace kyn::test
