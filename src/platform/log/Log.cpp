#include "platform/log/Log.h"

#include <syslog.h>
#include <systemd/sd-journal.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>

namespace kyn::platform {
namespace {

constexpr const char* kSubsystem = "com.zanto.tessel.kyn.assistant";
constexpr const char* kCategory = "_";

class JournalLogSink final : public LogSink {
 public:
  void write(const LogRecord& record) noexcept override {
    sd_journal_send("MESSAGE=%s", record.message.c_str(), "PRIORITY=%d", priority(record.level),
                    "SYSLOG_IDENTIFIER=kyn-assistant", "KYN_SUBSYSTEM=%s", record.subsystem.c_str(),
                    "KYN_CATEGORY=%s", record.category.c_str(), nullptr);
  }

 private:
  static int priority(LogLevel level) noexcept {
    switch (level) {
      case LogLevel::Debug: return LOG_DEBUG;
      case LogLevel::Info: return LOG_INFO;
      case LogLevel::Default: return LOG_NOTICE;
      default: return LOG_ERR;  // errors (a line at "off" is never written)
    }
  }
};

}  // namespace

std::string_view logLevelName(LogLevel level) noexcept {
  switch (level) {
    case LogLevel::Debug: return "debug";
    case LogLevel::Info: return "info";
    case LogLevel::Default: return "default";
    case LogLevel::Error: return "error";
    case LogLevel::Off: return "off";
  }
  return "default";
}

std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept {
  for (LogLevel l : {LogLevel::Debug, LogLevel::Info, LogLevel::Default, LogLevel::Error, LogLevel::Off}) {
    if (logLevelName(l) == name) return l;
  }
  return std::nullopt;
}

std::shared_ptr<LogSink> makeSystemLogSink() {
  std::error_code ec;
  if (std::filesystem::exists("/run/systemd/journal/socket", ec)) return std::make_shared<JournalLogSink>();
  return std::make_shared<StderrLogSink>();
}

void StderrLogSink::write(const LogRecord& record) noexcept {
  std::lock_guard lock(mutex_);
  std::fprintf(stderr, "kyn-assistant[%s:%s] %s: %s\n", record.subsystem.c_str(), record.category.c_str(),
               logLevelName(record.level).data(), record.message.c_str());
}

void CaptureLogSink::write(const LogRecord& record) noexcept {
  try {
    std::lock_guard lock(mutex_);
    records_.push_back(record);
  } catch (...) {
  }
}

std::vector<LogRecord> CaptureLogSink::records() const {
  std::lock_guard lock(mutex_);
  return records_;
}

std::vector<std::string> CaptureLogSink::messages() const {
  std::lock_guard lock(mutex_);
  std::vector<std::string> out;
  out.reserve(records_.size());
  for (const auto& r : records_) out.push_back(r.message);
  return out;
}

std::vector<std::string> CaptureLogSink::messages(LogLevel level) const {
  std::lock_guard lock(mutex_);
  std::vector<std::string> out;
  for (const auto& r : records_) {
    if (r.level == level) out.push_back(r.message);
  }
  return out;
}

bool CaptureLogSink::contains(std::string_view text) const {
  std::lock_guard lock(mutex_);
  for (const auto& r : records_) {
    if (r.message.find(text) != std::string::npos) return true;
  }
  return false;
}

void CaptureLogSink::clear() {
  std::lock_guard lock(mutex_);
  records_.clear();
}

Log::Log(std::string subsystem, std::string category)
    : subsystem_(std::move(subsystem)), category_(std::move(category)) {}

Log& Log::shared() {
  // Destroyed when the plug-in is unloaded, after every object that was made after it: the services
  // registry makes it first, so that what logs while it is torn down still finds it.
  static Log& configured = []() -> Log& {
    static Log log(kSubsystem, kCategory);
    if (const char* env = std::getenv("KYN_LOG_LEVEL")) {
      if (auto level = logLevelFromName(env)) log.setMinimumLevel(*level);
    }
    log.setSink(makeSystemLogSink());
    return log;
  }();
  return configured;
}

std::shared_ptr<LogSink> Log::setSink(std::shared_ptr<LogSink> sink) {
  std::lock_guard lock(sinkMutex_);
  std::swap(sink_, sink);
  return sink;
}

std::shared_ptr<LogSink> Log::sink() const {
  std::lock_guard lock(sinkMutex_);
  return sink_;
}

void Log::emit(LogLevel level, std::string message) noexcept {
  std::shared_ptr<LogSink> target = sink();
  if (!target) return;
  try {
    target->write(LogRecord{level, subsystem_, category_, std::move(message)});
  } catch (...) {
  }
}

}  // namespace kyn::platform
