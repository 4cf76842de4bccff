#pragma once

// The one dictionary/array/JSON value type of the system. It keeps insertion and document order and
// tells JSON null apart from a missing key.

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

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

/// Makes `object` (null becomes an empty object) hold `count` members without growing. An object
/// copies, rather than moves, its members each time it grows (their keys are const), values and all.
void reserveMembers(Value& object, std::size_t count);

struct JsonEntry;

/// A read-only look at a JSON value: a Value of a tree, or a value inside a parsed document
/// (`parseJsonDocument`), which must outlive the view. Cheap to copy; absent when default-made or
/// made from a null pointer. Readers of records take views, so that a tree and a document are read
/// by the same code.
class JsonView {
 public:
  JsonView() noexcept = default;
  JsonView(const Value* value) noexcept : kind_(value ? Kind::Tree : Kind::Absent), ptr_(value) {}  // NOLINT: implicit

  [[nodiscard]] explicit operator bool() const noexcept { return kind_ != Kind::Absent; }
  [[nodiscard]] bool isNull() const noexcept;
  [[nodiscard]] bool isBool() const noexcept;
  [[nodiscard]] bool isNumber() const noexcept;
  /// A number written without fraction or exponent.
  [[nodiscard]] bool isInteger() const noexcept;
  [[nodiscard]] bool isString() const noexcept;
  [[nodiscard]] bool isArray() const noexcept;
  [[nodiscard]] bool isObject() const noexcept;

  /// The member `key`; absent when this is no object or has no such key. Of a repeated key the
  /// last value.
  [[nodiscard]] JsonView member(std::string_view key) const noexcept;
  /// As `member`, but a JSON null counts as absent.
  [[nodiscard]] JsonView memberNotNull(std::string_view key) const noexcept;
  /// `member` of each of `keys` into the same place of `found`, in one walk over the members.
  void members(std::span<const std::string_view> keys, std::span<JsonView> found) const noexcept;
  /// The text of a string, valid as long as what it views; nothing for any other type.
  [[nodiscard]] std::optional<std::string_view> string() const noexcept;
  /// The items of an array, the members of an object (a document's repeated key as often as it
  /// occurs); 0 for anything else.
  [[nodiscard]] std::size_t size() const noexcept;
  /// A copy as a tree; null when absent. Of a repeated key the last value, at the first position.
  [[nodiscard]] Value toValue() const;

  using Entry = JsonEntry;
  /// Walks the items of an array or the members of an object in order; nothing for anything else.
  class Iterator {
   public:
    [[nodiscard]] Entry operator*() const noexcept;
    Iterator& operator++() noexcept;
    [[nodiscard]] bool operator!=(const Iterator& other) const noexcept { return at_ != other.at_; }

   private:
    friend class JsonView;
    const void* container_ = nullptr;  // the array or object, as its view holds it
    std::size_t at_ = 0;  // a tree: the position; a document: the index of the entry
    bool document_ = false;
    bool object_ = false;
  };
  [[nodiscard]] Iterator begin() const noexcept;
  [[nodiscard]] Iterator end() const noexcept;

  /// The value at `index` of a parsed document's own representation (for the document reader).
  [[nodiscard]] static JsonView inDocument(const void* document, std::size_t index) noexcept {
    JsonView view;
    view.kind_ = Kind::Document;
    view.ptr_ = document;
    view.index_ = index;
    return view;
  }

 private:
  friend struct JsonViewAccess;
  /// An iterator at the first item or member (`atEnd` false), or past the last.
  [[nodiscard]] Iterator iteratorAt(bool atEnd) const noexcept;
  enum class Kind : std::uint8_t { Absent, Tree, Document };
  [[nodiscard]] const Value& tree() const noexcept { return *static_cast<const Value*>(ptr_); }
  Kind kind_ = Kind::Absent;
  const void* ptr_ = nullptr;
  std::size_t index_ = 0;
};

/// One item of an array (empty key) or member of an object.
struct JsonEntry {
  std::string_view key;
  JsonView value;
};

/// The members of an object in order, of a repeated key the last value at the position of the first
/// (as `toValue` keeps them); empty for anything else.
[[nodiscard]] std::vector<JsonEntry> uniqueMembers(JsonView object);

/// The value when it is a JSON string; nothing for any other type.
[[nodiscard]] std::optional<std::string> stringValue(JsonView value);
/// `into = stringValue(value)`, with the text made in place rather than made and then moved.
void setStringValue(std::optional<std::string>& into, JsonView value);

/// The value when it is a JSON number (booleans are not numbers here).
[[nodiscard]] std::optional<double> numberValue(JsonView value) noexcept;

/// Yes/no as a number object reads it: a boolean, or a number that is not zero.
[[nodiscard]] std::optional<bool> boolValue(JsonView value) noexcept;

/// A value "read as an integer": a number truncated toward zero (saturated to 64 bits), a string by
/// its leading integer, a boolean as 1 or 0; anything else, and absence, read as 0.
[[nodiscard]] std::int64_t integerValue(JsonView value) noexcept;

/// The same, narrowed to 32 bits the way a number object's `intValue` narrows (wrapping).
[[nodiscard]] std::int32_t int32Value(JsonView value) noexcept;

}  // namespace platform
}  // namespace kyn
