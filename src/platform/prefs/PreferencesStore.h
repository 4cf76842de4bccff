#pragma once

#include "platform/value/Value.h"

#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// Persistent key-value preferences, one set per application domain. Thread-safe.
class PreferencesStore {
 public:
  virtual ~PreferencesStore() = default;

  /// The stored value, or nothing. Sees what other processes have synchronised.
  [[nodiscard]] virtual std::optional<Value> value(std::string_view domain, std::string_view key) = 0;
  /// Sets a value; nothing removes the key. Takes effect for this process at once and for others
  /// once the domain is synchronised.
  virtual void setValue(std::string_view domain, std::string_view key, std::optional<Value> value) = 0;
  /// Writes the domain's pending changes to disk. False when they could not be written.
  virtual bool synchronize(std::string_view domain) = 0;
};

}  // namespace kyn::platform
