#include "platform/notify/NotificationCenter.h"


#include <algorithm>

namespace kyn::platform {

NotificationCenter& NotificationCenter::defaultCenter() {
  static NotificationCenter center;  // made before the services registry, so destroyed after it
  return center;
}

NotificationCenter::Token NotificationCenter::addObserver(std::string name, Observer observer) {
  auto entry = std::make_shared<Entry>();
  entry->name = std::move(name);
  entry->observer = std::move(observer);
  std::lock_guard lock(mutex_);
  entry->token = next_++;
  entries_.push_back(entry);
  return entry->token;
}

void NotificationCenter::removeObserver(Token token) {
  std::shared_ptr<Entry> entry;
  {
    std::lock_guard lock(mutex_);
    auto it = std::find_if(entries_.begin(), entries_.end(), [&](const auto& e) { return e->token == token; });
    if (it == entries_.end()) return;
    entry = *it;
    entries_.erase(it);
  }
  std::lock_guard running(entry->running);  // waits for a call in progress on another thread
  entry->active = false;
}

void NotificationCenter::post(const Notification& notification) {
  std::vector<std::shared_ptr<Entry>> targets;
  {
    std::lock_guard lock(mutex_);
    for (const auto& e : entries_) {
      if (e->name == notification.name) targets.push_back(e);
    }
  }
  for (const auto& e : targets) {
    std::lock_guard running(e->running);
    if (!e->active) continue;
    try {
      e->observer(notification);
    } catch (...) {
      // An observer's failure must not stop the others or reach the poster.
    }
  }
}

}  // namespace kyn::platform
