#pragma once

#include "platform/core/Object.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

struct Notification {
  std::string name;
  std::shared_ptr<Object> object;
};

/// In-process notification centre. Thread-safe: observers may be added, removed and notified from
/// any thread; observers run on the posting thread.
class NotificationCenter {
 public:
  using Observer = std::function<void(const Notification&)>;
  using Token = std::uint64_t;

  /// The process-wide default centre.
  static NotificationCenter& defaultCenter();

  NotificationCenter() = default;
  NotificationCenter(const NotificationCenter&) = delete;
  NotificationCenter& operator=(const NotificationCenter&) = delete;

  /// Calls `observer` for every notification named `name`, from any sender.
  Token addObserver(std::string name, Observer observer);

  /// After this returns the observer is not running on another thread and is not called again.
  /// (Called from inside the observer itself, it returns at once.)
  void removeObserver(Token token);

  /// Calls the matching observers in the order they were added. An observer that throws is skipped.
  void post(const Notification& notification);

 private:
  struct Entry {
    Token token;
    std::string name;
    Observer observer;
    std::recursive_mutex running;  // held while the observer runs
    bool active = true;            // guarded by `running`
  };

  std::mutex mutex_;
  std::vector<std::shared_ptr<Entry>> entries_;
  Token next_ = 1;
};

}  // namespace kyn::platform
