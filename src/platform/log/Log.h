#pragma once

#include "platform/log/Format.h"

#include <atomic>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

/// Levels in increasing order of importance; `Off` as a minimum level silences the log.
enum class LogLevel : int { Debug = 0, Info = 1, Default = 2, Error = 3, Off = 4 };

[[nodiscard]] std::string_view logLevelName(LogLevel level) noexcept;
/// "debug", "info", "default", "error", "off"; nothing for another word.
[[nodiscard]] std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept;

struct LogRecord {
  LogLevel level;
  std::string subsystem;
  std::string category;
  std::string message;
};

/// Where log lines go. Implementations are thread-safe.
class LogSink {
 public:
  virtual ~LogSink() = default;
  virtual void write(const LogRecord& record) noexcept = 0;
};

/// The systemd journal when it runs on this machine, standard error otherwise.
[[nodiscard]] std::shared_ptr<LogSink> makeSystemLogSink();

/// Lines to standard error: "kyn-assistant[subsystem:category] level: message".
class StderrLogSink final : public LogSink {
 public:
  void write(const LogRecord& record) noexcept override;

 private:
  std::mutex mutex_;
};

/// Keeps every line, for tests and for hosts that show the log themselves.
class CaptureLogSink final : public LogSink {
 public:
  void write(const LogRecord& record) noexcept override;
  [[nodiscard]] std::vector<LogRecord> records() const;
  /// The messages, in order, optionally only those of one level.
  [[nodiscard]] std::vector<std::string> messages() const;
  [[nodiscard]] std::vector<std::string> messages(LogLevel level) const;
  /// True when any message contains `text`.
  [[nodiscard]] bool contains(std::string_view text) const;
  void clear();

 private:
  mutable std::mutex mutex_;
  std::vector<LogRecord> records_;
};

/// A log object with a subsystem and a category. Lines below the minimum level are not even
/// formatted. Thread-safe; never throws.
class Log {
 public:
  Log(std::string subsystem, std::string category);

  /// The plug-in's one log object: subsystem "com.zanto.tessel.kyn.assistant", category "_". Its
  /// minimum level comes from KYN_LOG_LEVEL (default "info") and its sink is the system's.
  static Log& shared();

  [[nodiscard]] bool isEnabled(LogLevel level) const noexcept {
    return level != LogLevel::Off && static_cast<int>(level) >= minimum_.load(std::memory_order_relaxed);
  }

  template <class... Args>
  void log(LogLevel level, std::string_view fmt, const Args&... args) noexcept {
    if (!isEnabled(level)) return;
    try {
      emit(level, format(fmt, args...));
    } catch (...) {
      // Formatting failed (out of memory): the line is lost, the caller goes on.
    }
  }

  template <class... Args>
  void notice(std::string_view fmt, const Args&... args) noexcept {
    log(LogLevel::Default, fmt, args...);
  }
  template <class... Args>
  void info(std::string_view fmt, const Args&... args) noexcept {
    log(LogLevel::Info, fmt, args...);
  }
  template <class... Args>
  void error(std::string_view fmt, const Args&... args) noexcept {
    log(LogLevel::Error, fmt, args...);
  }

  void setMinimumLevel(LogLevel level) noexcept { minimum_.store(static_cast<int>(level)); }
  [[nodiscard]] LogLevel minimumLevel() const noexcept { return static_cast<LogLevel>(minimum_.load()); }

  /// Replaces the sink and returns the previous one.
  std::shared_ptr<LogSink> setSink(std::shared_ptr<LogSink> sink);
  [[nodiscard]] std::shared_ptr<LogSink> sink() const;

  [[nodiscard]] const std::string& subsystem() const noexcept { return subsystem_; }
  [[nodiscard]] const std::string& category() const noexcept { return category_; }

 private:
  void emit(LogLevel level, std::string message) noexcept;

  std::string subsystem_;
  std::string category_;
  std::atomic<int> minimum_{static_cast<int>(LogLevel::Info)};
  mutable std::mutex sinkMutex_;
  std::shared_ptr<LogSink> sink_;
};

}  // namespace kyn::platform
