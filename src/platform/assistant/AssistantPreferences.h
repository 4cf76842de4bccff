#pragma once

#include <mutex>
#include <optional>
#include <string>

namespace kyn::platform {

/// The assistant's own preferences, as the host hands them to the plug-in. Thread-safe.
class AssistantPreferences {
 public:
  AssistantPreferences() = default;
  explicit AssistantPreferences(std::optional<std::string> languageCode) : languageCode_(std::move(languageCode)) {}

  /// The assistant's language as a BCP 47 tag ("en-US"), which may differ from the system's.
  [[nodiscard]] std::optional<std::string> languageCode() const {
    std::lock_guard lock(mutex_);
    return languageCode_;
  }
  void setLanguageCode(std::optional<std::string> code) {
    std::lock_guard lock(mutex_);
    languageCode_ = std::move(code);
  }

 private:
  mutable std::mutex mutex_;
  std::optional<std::string> languageCode_;
};

/// The language of the process's locale (from LANG and friends) as a BCP 47 tag; nothing for the
/// C/POSIX locale.
[[nodiscard]] std::optional<std::string> systemLanguageTag();

}  // namespace kyn::platform
