#pragma once

// The one dictionary/array/JSON value type of the system. It keeps insertion and document order and
// tells JSON null apart from a missing key.

#include <nlohmann/json.hpp>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace kyn {

using Value = nlohmann::ordered_json;

namespace platform {

/// The member `key` of `object`; nullptr when `object` is null, no JSON object, or has no such key.
[[nodiscard]] const Value* member(const Value* object, std::string_view key) noexcept;
[[nodiscard]] inline const Value* member(const Value& object, std::string_view key) noexcept {
  return member(&object, key);
}

/// As `member`, but a JSON null counts as absent.
[[nodiscard]] const Value* memberNotNull(const Value* object, std::string_view key) noexcept;

/// The value when it is a JSON string; nothing for any other type.
[[nodiscard]] std::optional<std::string> stringValue(const Value* value);

/// The value when it is a JSON number (booleans are not numbers here).
[[nodiscard]] std::optional<double> numberValue(const Value* value) noexcept;

/// Yes/no as a number object reads it: a boolean, or a number that is not zero.
[[nodiscard]] std::optional<bool> boolValue(const Value* value) noexcept;

/// A value "read as an integer": a number truncated toward zero (saturated to 64 bits), a string by
/// its leading integer, a boolean as 1 or 0; anything else, and absence, read as 0.
[[nodiscard]] std::int64_t integerValue(const Value* value) noexcept;

/// The same, narrowed to 32 bits the way a number object's `intValue` narrows (wrapping).
[[nodiscard]] std::int32_t int32Value(const Value* value) noexcept;

}  // namespace platform
}  // namespace kyn
