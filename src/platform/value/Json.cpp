#include "platform/value/Json.h"

#include <cmath>
#include <memory>
#include <unordered_map>
#include <utility>
#include <vector>

namespace kyn::platform {
namespace {

// Builds a Value from nlohmann's SAX events. Unlike the library's own DOM builder it bounds the
// nesting depth, rejects non-finite numbers, and indexes large objects so that checking each new key
// for a duplicate stays constant time (an ordered object otherwise searches its members linearly,
// which makes a large object quadratic to build).
class Builder {
 public:
  explicit Builder(std::size_t maxDepth) : maxDepth_(maxDepth) {}

  bool null() { return put(Value(nullptr)) != nullptr; }
  bool boolean(bool v) { return put(Value(v)) != nullptr; }
  bool number_integer(Value::number_integer_t v) { return put(Value(v)) != nullptr; }
  bool number_unsigned(Value::number_unsigned_t v) { return put(Value(v)) != nullptr; }
  bool number_float(Value::number_float_t v, const std::string& /*text*/) {
    if (!std::isfinite(v)) return false;
    return put(Value(v)) != nullptr;
  }
  bool string(std::string& v) { return put(Value(std::move(v))) != nullptr; }
  bool binary(Value::binary_t& /*v*/) { return false; }

  bool start_object(std::size_t /*size*/) {
    if (frames_.size() >= maxDepth_) return false;
    Value* v = put(Value::object());
    if (v == nullptr) return false;
    frames_.push_back(Frame{v, nullptr, {}});
    return true;
  }

  bool key(std::string& k) {
    Frame& f = frames_.back();
    // ordered_map's operator[] looks up keys; index the vector underneath it instead.
    auto& map = static_cast<Value::object_t::Container&>(f.container->get_ref<Value::object_t&>());
    std::size_t index = map.size();
    if (f.index) {
      auto it = f.index->find(k);
      if (it != f.index->end()) index = it->second;
    } else {
      for (std::size_t i = 0; i < map.size(); ++i) {
        if (map[i].first == k) {
          index = i;
          break;
        }
      }
    }
    if (index == map.size()) {
      if (f.index) f.index->emplace(k, index);
      map.emplace_back(std::move(k), Value());
      if (!f.index && map.size() > kIndexThreshold) {
        f.index = std::make_unique<std::unordered_map<std::string, std::size_t>>();
        f.index->reserve(map.size() * 2);
        for (std::size_t i = 0; i < map.size(); ++i) f.index->emplace(map[i].first, i);
      }
    }
    f.slot = &map[index].second;
    return true;
  }

  bool end_object() {
    frames_.pop_back();
    return true;
  }

  bool start_array(std::size_t /*size*/) {
    if (frames_.size() >= maxDepth_) return false;
    Value* v = put(Value::array());
    if (v == nullptr) return false;
    frames_.push_back(Frame{v, nullptr, {}});
    return true;
  }

  bool end_array() {
    frames_.pop_back();
    return true;
  }

  bool parse_error(std::size_t /*position*/, const std::string& /*token*/,
                   const nlohmann::detail::exception& /*error*/) {
    return false;
  }

  Value take() { return std::move(root_); }

 private:
  static constexpr std::size_t kIndexThreshold = 16;

  struct Frame {
    Value* container;
    Value* slot;  // for objects: where the value of the last key goes
    std::unique_ptr<std::unordered_map<std::string, std::size_t>> index;
  };

  Value* put(Value&& v) {
    if (frames_.empty()) {
      root_ = std::move(v);
      return &root_;
    }
    Frame& f = frames_.back();
    if (f.container->is_array()) {
      auto& array = f.container->get_ref<Value::array_t&>();
      array.push_back(std::move(v));
      return &array.back();
    }
    if (f.slot == nullptr) return nullptr;
    *f.slot = std::move(v);
    Value* placed = f.slot;
    f.slot = nullptr;
    return placed;
  }

  std::size_t maxDepth_;
  Value root_;
  std::vector<Frame> frames_;
};

}  // namespace

std::optional<Value> parseJson(std::string_view text, const JsonLimits& limits) noexcept {
  if (text.size() > limits.maxBytes) return std::nullopt;
  // The lexer takes a NUL byte for the end of the input and would ignore whatever follows it; a raw
  // NUL is valid nowhere in JSON, so such a text is refused outright.
  if (text.find('\0') != std::string_view::npos) return std::nullopt;
  try {
    Builder builder(limits.maxDepth);
    const bool ok = Value::sax_parse(text.begin(), text.end(), &builder, Value::input_format_t::json,
                                     /*strict=*/true, /*ignore_comments=*/false);
    if (!ok) return std::nullopt;
    return builder.take();
  } catch (...) {
    return std::nullopt;
  }
}

std::string toJson(const Value& value, int indent) noexcept {
  try {
    return value.dump(indent, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace);
  } catch (...) {
    return "null";
  }
}

}  // namespace kyn::platform
