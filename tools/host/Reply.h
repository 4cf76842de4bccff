#pragma once

// Waiting for the one reply of a command.

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <optional>
#include <string>

namespace kyn::host {

/// Where the plug-in delivers the reply of one command: pass `&Reply::receive` and the box as the
/// context of kyn_plugin_perform. Counts every delivery, so a test can tell that exactly one came.
class Reply {
 public:
  static void receive(const char* json, void* context);

  /// The first reply, waiting at most `timeout` for it.
  [[nodiscard]] std::optional<std::string> wait(std::chrono::duration<double> timeout);
  /// How many replies came so far.
  [[nodiscard]] int count() const;

 private:
  mutable std::mutex mutex_;
  std::condition_variable arrived_;
  std::optional<std::string> first_;
  int count_ = 0;
};

}  // namespace kyn::host
