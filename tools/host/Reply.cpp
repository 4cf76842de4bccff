#include "host/Reply.h"

namespace kyn::host {

void Reply::receive(const char* json, void* context) {
  auto* box = static_cast<Reply*>(context);
  std::lock_guard lock(box->mutex_);
  if (++box->count_ == 1) box->first_ = json != nullptr ? json : "";
  box->arrived_.notify_all();
}

std::optional<std::string> Reply::wait(std::chrono::duration<double> timeout) {
  std::unique_lock lock(mutex_);
  arrived_.wait_for(lock, timeout, [this] { return first_.has_value(); });
  return first_;
}

int Reply::count() const {
  std::lock_guard lock(mutex_);
  return count_;
}

}  // namespace kyn::host
