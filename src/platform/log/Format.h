#pragma once

// Renders the system's own texts with `%@`, `%ld`, `%li`, `%d` (and positional `%1$@`) placeholders,
// for log lines and localised formats alike. `%@` of an object is its description.

#include "platform/core/Object.h"
#include "platform/value/Value.h"

#include <concepts>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <variant>
#include <vector>

namespace kyn::platform {

/// One argument of a format, kept as its text, an integer or a double.
class FormatArg {
 public:
  FormatArg(const char* text) : v_(text ? std::string(text) : std::string("(null)")) {}
  FormatArg(std::string_view text) : v_(std::string(text)) {}
  FormatArg(const std::string& text) : v_(text) {}
  FormatArg(const std::optional<std::string>& text) : v_(text ? *text : std::string("(null)")) {}
  FormatArg(std::nullptr_t) : v_(std::string("(null)")) {}
  FormatArg(bool b) : v_(std::int64_t{b ? 1 : 0}) {}
  template <std::integral T>
    requires(!std::same_as<T, bool>)
  FormatArg(T n) : v_(static_cast<std::int64_t>(n)) {}
  FormatArg(double d) : v_(d) {}
  FormatArg(const std::optional<double>& d) : v_(d ? Variant(*d) : Variant(std::string("(null)"))) {}
  FormatArg(const Value& value);
  FormatArg(const Value* value);
  FormatArg(JsonView value);
  FormatArg(const Object& object) : v_(object.description()) {}
  template <class T>
    requires std::derived_from<T, Object>
  FormatArg(const std::shared_ptr<T>& object) : v_(object ? object->description() : std::string("(null)")) {}
  template <class T>
    requires std::derived_from<T, Object>
  FormatArg(const std::vector<std::shared_ptr<T>>& objects) : v_(describeArray(objects)) {}
  template <class T>
    requires std::derived_from<T, Object>
  FormatArg(const std::optional<std::vector<std::shared_ptr<T>>>& objects)
      : v_(objects ? describeArray(*objects) : std::string("(null)")) {}

  /// The text for `%@` and `%s`.
  [[nodiscard]] std::string text() const;
  /// The same text, appended to `out`.
  void appendText(std::string& out) const;
  /// About how long the text is, to make room for it.
  [[nodiscard]] std::size_t sizeHint() const noexcept;
  /// The text of `%@` for an array of objects: "(", their descriptions joined by ", ", ")".
  template <class T>
  [[nodiscard]] static std::string describeArray(const std::vector<std::shared_ptr<T>>& objects) {
    std::string out = "(";
    for (std::size_t i = 0; i < objects.size(); ++i) {
      if (i) out += ", ";
      if (objects[i]) objects[i]->appendDescription(out);
      else out += "(null)";
    }
    out += ")";
    return out;
  }
  /// The value for `%d`, `%ld`, `%li`, `%u`: an integer, a double truncated, a text by its leading integer.
  [[nodiscard]] std::int64_t integer() const;
  /// The value for `%f`.
  [[nodiscard]] double floating() const;

 private:
  using Variant = std::variant<std::string, std::int64_t, double>;

  Variant v_;
};

/// Renders `format` with `args`. Unknown placeholders stay as they are; a placeholder without an
/// argument renders as nothing.
[[nodiscard]] std::string formatArgs(std::string_view format, std::span<const FormatArg> args);

template <class... Args>
[[nodiscard]] std::string format(std::string_view fmt, const Args&... args) {
  if constexpr (sizeof...(Args) == 0) {
    return formatArgs(fmt, {});
  } else {
    const FormatArg list[] = {FormatArg(args)...};
    return formatArgs(fmt, list);
  }
}

}  // namespace kyn::platform
