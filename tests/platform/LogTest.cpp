#include "platform/log/Log.h"

#include <gtest/gtest.h>

namespace kyn::platform {
namespace {

TEST(Log, LinesBelowTheMinimumLevelAreDroppedAndLevelsHaveNames) {
  Log log("s", "c");
  auto sink = std::make_shared<CaptureLogSink>();
  log.setSink(sink);
  log.setMinimumLevel(LogLevel::Default);
  log.info("hidden %@", "x");
  log.notice("shown %@", "y");
  log.error("failed %ld", 3);
  auto records = sink->records();
  ASSERT_EQ(records.size(), 2u);
  EXPECT_EQ(records[0].message, "shown y");
  EXPECT_EQ(records[0].level, LogLevel::Default);
  EXPECT_EQ(records[0].subsystem, "s");
  EXPECT_EQ(records[1].level, LogLevel::Error);
  EXPECT_FALSE(log.isEnabled(LogLevel::Info));
  log.setMinimumLevel(LogLevel::Off);
  log.error("silenced");
  EXPECT_EQ(sink->records().size(), 2u);
  EXPECT_EQ(logLevelFromName("error"), LogLevel::Error);
  EXPECT_EQ(logLevelFromName("off"), LogLevel::Off);
}

}  // namespace
}  // namespace kyn::platform
