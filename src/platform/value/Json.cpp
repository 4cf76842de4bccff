#include "platform/value/Json.h"

#include "platform/text/StringEscapes.h"

#include <simdjson.h>

#include <charconv>
#include <cmath>
#include <deque>
#include <memory>
#include <mutex>
#include <unordered_map>
#include <utility>
#include <vector>

namespace kyn::platform {
namespace {

/// Objects with more members than this get a hash index of their keys while they are read.
constexpr std::size_t kIndexThreshold = 16;

// Builds a Value from nlohmann's SAX events. Unlike the library's own DOM builder it bounds the
// nesting depth, rejects non-finite numbers, and indexes large objects so that checking each new key
// for a duplicate stays constant time (an ordered object otherwise searches its members linearly,
// which makes a large object quadratic to build).
//
// The members of an open object gather in a plain vector of (key, value) pairs and move into the
// object only when it closes, into storage of the exact size. The object's own storage holds pairs
// with a const key, which a growing vector copies rather than moves: every value already read,
// with all it contains, would be copied again each time the object grew.
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
    // Each depth keeps its member vector, so that the objects of one depth share its storage.
    if (members_.size() <= frames_.size()) members_.resize(frames_.size() + 1);
    frames_.push_back(Frame{v, nullptr, &members_[frames_.size()], {}});
    return true;
  }

  bool key(std::string& k) {
    Frame& f = frames_.back();
    Members& members = *f.members;
    std::size_t index = members.size();
    if (f.index) {
      auto it = f.index->find(k);
      if (it != f.index->end()) index = it->second;
    } else {
      for (std::size_t i = 0; i < members.size(); ++i) {
        if (members[i].first == k) {
          index = i;
          break;
        }
      }
    }
    if (index == members.size()) {
      if (f.index) f.index->emplace(k, index);
      members.emplace_back(std::move(k), Value());
      if (!f.index && members.size() > kIndexThreshold) {
        f.index = std::make_unique<std::unordered_map<std::string, std::size_t>>();
        f.index->reserve(members.size() * 2);
        for (std::size_t i = 0; i < members.size(); ++i) f.index->emplace(members[i].first, i);
      }
    }
    f.slot = &members[index].second;
    return true;
  }

  bool end_object() {
    Frame& f = frames_.back();
    auto& object = static_cast<Value::object_t::Container&>(f.container->get_ref<Value::object_t&>());
    object.reserve(f.members->size());
    for (auto& [k, v] : *f.members) object.emplace_back(std::move(k), std::move(v));
    f.members->clear();
    frames_.pop_back();
    return true;
  }

  bool start_array(std::size_t size) {
    if (frames_.size() >= maxDepth_) return false;
    Value* v = put(Value::array());
    if (v == nullptr) return false;
    if (size != kUnknownSize) v->get_ref<Value::array_t&>().reserve(size);
    frames_.push_back(Frame{v, nullptr, nullptr, {}});
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
  static constexpr std::size_t kUnknownSize = static_cast<std::size_t>(-1);
  using Members = std::vector<std::pair<std::string, Value>>;

  struct Frame {
    Value* container;
    Value* slot;       // for objects: where the value of the last key goes
    Members* members;  // for objects: the members read so far; nullptr for arrays
    std::unique_ptr<std::unordered_map<std::string, std::size_t>> index;
  };

  Value* put(Value&& v) {
    if (frames_.empty()) {
      root_ = std::move(v);
      return &root_;
    }
    Frame& f = frames_.back();
    if (f.members == nullptr) {
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
  std::deque<Members> members_;  // by depth; a deque, so that growing it moves none
};

/// Makes the Value of a document that simdjson has read, by the rules of Builder: the nesting depth
/// bounded, non-finite numbers refused, of duplicate keys the last value at the position of the
/// first. Each container is made at its final size, so nothing it holds is moved again; keys are
/// compared and indexed as views into simdjson's document, which lives as long as this does.
class Converter {
 public:
  explicit Converter(std::size_t maxDepth) : maxDepth_(maxDepth) {}

  /// False when the document breaks a rule; `out` is then unspecified.
  bool convert(simdjson::dom::element element, Value& out, std::size_t depth = 0) {
    using simdjson::dom::element_type;
    switch (element.type()) {
      case element_type::ARRAY: {
        if (depth >= maxDepth_) return false;
        const simdjson::dom::array array = element.get_array().value_unsafe();
        out = Value::array();
        auto& items = out.get_ref<Value::array_t&>();
        items.reserve(array.size());
        for (const simdjson::dom::element item : array) {
          if (!convert(item, items.emplace_back(), depth + 1)) return false;
        }
        return true;
      }
      case element_type::OBJECT: {
        if (depth >= maxDepth_) return false;
        const simdjson::dom::object object = element.get_object().value_unsafe();
        out = Value::object();
        auto& members = static_cast<Value::object_t::Container&>(out.get_ref<Value::object_t&>());
        const std::size_t size = object.size();
        members.reserve(size);
        std::unordered_map<std::string_view, std::size_t> index;  // for large objects only
        if (size > kIndexThreshold) index.reserve(size);
        for (const simdjson::dom::key_value_pair member : object) {
          std::size_t at = members.size();
          if (size > kIndexThreshold) {
            const auto [it, added] = index.emplace(member.key, at);
            if (!added) at = it->second;
          } else {
            for (std::size_t i = 0; i < members.size(); ++i) {
              if (members[i].first == member.key) {
                at = i;
                break;
              }
            }
          }
          if (at == members.size()) members.emplace_back(std::string(member.key), Value());
          Value& slot = members[at].second;
          slot = Value();  // a repeated key's value is replaced as a whole
          if (!convert(member.value, slot, depth + 1)) return false;
        }
        return true;
      }
      case element_type::STRING:
        out = Value(std::string(element.get_string().value_unsafe()));
        return true;
      case element_type::INT64: {
        // nlohmann keeps every non-negative integer unsigned.
        const std::int64_t v = element.get_int64().value_unsafe();
        out = v >= 0 ? Value(static_cast<Value::number_unsigned_t>(v)) : Value(static_cast<Value::number_integer_t>(v));
        return true;
      }
      case element_type::UINT64:
        out = Value(static_cast<Value::number_unsigned_t>(element.get_uint64().value_unsafe()));
        return true;
      case element_type::DOUBLE: {
        const double v = element.get_double().value_unsafe();
        if (!std::isfinite(v)) return false;
        out = Value(static_cast<Value::number_float_t>(v));
        return true;
      }
      case element_type::BOOL:
        out = Value(element.get_bool().value_unsafe());
        return true;
      case element_type::NULL_VALUE:
        out = Value(nullptr);
        return true;
    }
    return false;
  }

 private:
  std::size_t maxDepth_;
};

/// Texts up to this size are read by a kept parser, which keeps its buffers (about fourteen bytes
/// per byte of text); a larger one gets a parser of its own, so that one large answer does not
/// hold its memory for good. Keeping it saves nothing measurable at that size.
constexpr std::size_t kKeptParserBytes = 256u * 1024u;

/// The kept parsers, lent out one per reading under a lock. Not thread-local: the plug-in may be
/// unloaded while the host's threads live on, and their thread-local storage of an unloaded
/// library is left dangling (the leak checker trips over it).
class ParserPool {
 public:
  std::unique_ptr<simdjson::dom::parser> take() {
    {
      std::lock_guard lock(mutex_);
      if (!idle_.empty()) {
        auto parser = std::move(idle_.back());
        idle_.pop_back();
        return parser;
      }
    }
    return std::make_unique<simdjson::dom::parser>();
  }
  void giveBack(std::unique_ptr<simdjson::dom::parser> parser) noexcept {
    std::lock_guard lock(mutex_);
    if (idle_.size() < kKept) idle_.push_back(std::move(parser));  // reserved: never throws
  }
  ParserPool() { idle_.reserve(kKept); }

 private:
  static constexpr std::size_t kKept = 4;  // a host thread or two and the network threads
  std::mutex mutex_;
  std::vector<std::unique_ptr<simdjson::dom::parser>> idle_;
};

/// The text read by simdjson, several times faster than nlohmann's own reader; nothing when
/// simdjson refuses it, and then nlohmann's reader decides.
std::optional<Value> parseFast(std::string_view text, const JsonLimits& limits) {
  if (text.empty()) return std::nullopt;  // simdjson would copy from a null pointer
  // Surrogate escapes are left to nlohmann's reader, which refuses every unpaired one.
  for (std::size_t at = text.find("\\u"); at != std::string_view::npos; at = text.find("\\u", at + 2)) {
    if (at + 2 < text.size() && (text[at + 2] == 'd' || text[at + 2] == 'D')) return std::nullopt;
  }
  static ParserPool pool;
  const bool keep = text.size() <= kKeptParserBytes;
  auto parser = keep ? pool.take() : std::make_unique<simdjson::dom::parser>();
  struct GiveBack {
    ParserPool& pool;
    std::unique_ptr<simdjson::dom::parser>& parser;
    bool keep;
    ~GiveBack() {
      if (keep) pool.giveBack(std::move(parser));
    }
  } giveBack{pool, parser, keep};
  simdjson::dom::element root;
  if (parser->parse(text.data(), text.size()).get(root) != simdjson::SUCCESS) return std::nullopt;
  Value value;
  if (!Converter(limits.maxDepth).convert(root, value)) return std::nullopt;
  return value;
}

}  // namespace

void releaseValue(Value& value) noexcept {
  if (value.is_array()) {
    auto& items = value.get_ref<Value::array_t&>();
    for (Value& item : items) {
      if (item.is_structured()) releaseValue(item);
    }
    items.clear();
  } else if (value.is_object()) {
    auto& members = static_cast<Value::object_t::Container&>(value.get_ref<Value::object_t&>());
    for (auto& member : members) {
      if (member.second.is_structured()) releaseValue(member.second);
    }
    members.clear();
  }
}

void appendJsonString(std::string& out, std::string_view text) {
  const std::size_t start = out.size();
  out += '"';
  bool checked = false;  // the whole text has been found to be valid UTF-8
  std::size_t run = 0;   // where the characters not yet written begin
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (c >= 0x80) {
      if (checked) continue;
      if (!isValidUtf8(text.substr(i))) {
        // Rare: the library's own writer decides how each bad byte is replaced.
        out.resize(start);
        out += Value(std::string(text)).dump(-1, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace);
        return;
      }
      checked = true;
      continue;
    }
    if (c >= 0x20 && c != '"' && c != '\\') continue;
    out.append(text.data() + run, i - run);
    run = i + 1;
    switch (c) {
      case '"': out += "\\\""; break;
      case '\\': out += "\\\\"; break;
      case '\b': out += "\\b"; break;
      case '\f': out += "\\f"; break;
      case '\n': out += "\\n"; break;
      case '\r': out += "\\r"; break;
      case '\t': out += "\\t"; break;
      default: {
        static constexpr char kHex[] = "0123456789abcdef";
        const char escaped[] = {'\\', 'u', '0', '0', kHex[c >> 4], kHex[c & 0xF]};
        out.append(escaped, sizeof escaped);
      }
    }
  }
  out.append(text.data() + run, text.size() - run);
  out += '"';
}

void appendJsonNumber(std::string& out, double value) {
  if (!std::isfinite(value)) {
    out += "null";
    return;
  }
  // The library's own shortest form, so that the text is the one `toJson` writes.
  char buffer[64];
  const char* end = nlohmann::detail::to_chars(buffer, buffer + sizeof buffer, value);
  out.append(buffer, static_cast<std::size_t>(end - buffer));
}

void appendJsonNumber(std::string& out, std::int64_t value) {
  char buffer[24];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  out.append(buffer, static_cast<std::size_t>(result.ptr - buffer));
}

std::optional<Value> parseJson(std::string_view text, const JsonLimits& limits) noexcept {
  if (text.size() > limits.maxBytes) return std::nullopt;
  // The lexer takes a NUL byte for the end of the input and would ignore whatever follows it; a raw
  // NUL is valid nowhere in JSON, so such a text is refused outright.
  if (text.find('\0') != std::string_view::npos) return std::nullopt;
  try {
    if (auto fast = parseFast(text, limits)) return fast;
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
