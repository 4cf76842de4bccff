#include "platform/value/Value.h"

#include "platform/text/StringEscapes.h"

#include <cmath>
#include <limits>

namespace kyn::platform {

const Value* member(const Value* object, std::string_view key) noexcept {
  if (object == nullptr || !object->is_object()) return nullptr;
  const auto& map = object->get_ref<const Value::object_t&>();
  for (const auto& entry : map) {
    if (entry.first == key) return &entry.second;
  }
  return nullptr;
}

const Value* memberNotNull(const Value* object, std::string_view key) noexcept {
  const Value* v = member(object, key);
  return (v != nullptr && v->is_null()) ? nullptr : v;
}

std::optional<std::string> stringValue(const Value* value) {
  if (value == nullptr || !value->is_string()) return std::nullopt;
  return value->get_ref<const std::string&>();
}

std::optional<double> numberValue(const Value* value) noexcept {
  if (value == nullptr || !value->is_number()) return std::nullopt;
  return value->get<double>();
}

std::optional<bool> boolValue(const Value* value) noexcept {
  if (value == nullptr) return std::nullopt;
  if (value->is_boolean()) return value->get<bool>();
  if (value->is_number()) return value->get<double>() != 0.0;
  return std::nullopt;
}

std::int64_t integerValue(const Value* value) noexcept {
  if (value == nullptr) return 0;
  if (value->is_number_integer()) {
    if (value->is_number_unsigned()) {
      auto u = value->get<std::uint64_t>();
      return u > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())
                 ? std::numeric_limits<std::int64_t>::max()
                 : static_cast<std::int64_t>(u);
    }
    return value->get<std::int64_t>();
  }
  if (value->is_number_float()) {
    double d = value->get<double>();
    if (std::isnan(d)) return 0;
    if (d >= 9.2233720368547758e18) return std::numeric_limits<std::int64_t>::max();
    if (d <= -9.2233720368547758e18) return std::numeric_limits<std::int64_t>::min();
    return static_cast<std::int64_t>(d);
  }
  if (value->is_boolean()) return value->get<bool>() ? 1 : 0;
  if (value->is_string()) return leadingInteger64(value->get_ref<const std::string&>());
  return 0;
}

std::int32_t int32Value(const Value* value) noexcept {
  if (value != nullptr && value->is_string()) return leadingInteger32(value->get_ref<const std::string&>());
  // Modular narrowing, as a number object's 32-bit accessor does.
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(static_cast<std::uint64_t>(integerValue(value))));
}

}  // namespace kyn::platform
