#include "platform/value/Value.h"

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

void reserveMembers(Value& object, std::size_t count) {
  if (object.is_null()) object = Value::object();
  static_cast<Value::object_t::Container&>(object.get_ref<Value::object_t&>()).reserve(count);
}

}  // namespace kyn::platform
