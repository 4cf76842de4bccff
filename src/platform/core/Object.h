#pragma once

#include <string>

namespace kyn::platform {

/// Root of the objects that are shared by reference and can describe themselves in a log line.
class Object {
 public:
  virtual ~Object() = default;

  /// The text that `%@` prints for this object. Never holds a secret such as the application token.
  [[nodiscard]] virtual std::string description() const = 0;
  /// Appends the description to `out`; objects with long descriptions write them in place.
  virtual void appendDescription(std::string& out) const { out += description(); }
};

}  // namespace kyn::platform
