#pragma once

#include "platform/text/Words.h"
#include "platform/value/Value.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// Bounds on JSON texts from outside the process.
struct JsonLimits {
  std::size_t maxBytes = 16u * 1024u * 1024u;
  std::size_t maxDepth = 200;
};

/// Parses a JSON text. Returns nothing for a text that is not JSON, is too large or too deep, holds
/// invalid UTF-8, or a number that does not fit a double. Never throws. Work is linear in the text.
/// Of duplicate keys in one object the last value wins, at the position of the first.
[[nodiscard]] std::optional<Value> parseJson(std::string_view text, const JsonLimits& limits = {}) noexcept;

/// A parsed JSON text, read through `root()` without building a tree. Views into it stay valid as
/// long as the document lives; moving it keeps them valid.
class JsonDocument {
 public:
  JsonDocument() noexcept;
  ~JsonDocument();
  JsonDocument(JsonDocument&& other) noexcept;
  JsonDocument& operator=(JsonDocument&& other) noexcept;
  JsonDocument(const JsonDocument&) = delete;
  JsonDocument& operator=(const JsonDocument&) = delete;

  /// The top-level value; absent for a default-made document.
  [[nodiscard]] JsonView root() const noexcept { return root_; }

  /// What a document holds, kept for the next reading when the document goes.
  struct Storage;

 private:
  friend std::optional<JsonDocument> parseJsonDocument(std::string_view text, const JsonLimits& limits) noexcept;
  friend std::optional<JsonDocument> parseJsonDocumentInPlace(std::string& text, const JsonLimits& limits) noexcept;
  /// The reading of both; with `padded`, room that may be read follows the text.
  static std::optional<JsonDocument> read(std::string_view text, const JsonLimits& limits, bool padded) noexcept;
  friend std::optional<Value> parseJson(std::string_view text, const JsonLimits& limits) noexcept;
  std::unique_ptr<Storage> storage_;
  JsonView root_;
};

/// Parses a JSON text by the rules of `parseJson` into a document.
[[nodiscard]] std::optional<JsonDocument> parseJsonDocument(std::string_view text, const JsonLimits& limits = {}) noexcept;
/// The same for a text that may be given room after its end, which saves copying it before
/// reading: the text stays as it is, its capacity may grow.
[[nodiscard]] std::optional<JsonDocument> parseJsonDocumentInPlace(std::string& text, const JsonLimits& limits = {}) noexcept;

/// Serialises a value. Invalid UTF-8 in strings is replaced by U+FFFD; never throws.
[[nodiscard]] std::string toJson(const Value& value, int indent = -1) noexcept;
/// The same for a view; "null" when it is absent.
[[nodiscard]] std::string toJson(JsonView value, int indent = -1) noexcept;

/// Empties `value` from its leaves up, for a value about to go: the library's own teardown moves
/// every member of each nested value through a stack it allocates, which costs more than the
/// building did. Recursion is as deep as the value (parsed values are bounded by JsonLimits).
void releaseValue(Value& value) noexcept;

/// Writes JSON text at the end of a string through a cursor, for writers that do without a Value:
/// each piece is what `toJson` writes for the same string or number, except that a number is
/// sometimes written in fewer digits than the library's (which are not always the fewest), for the
/// same double. Room is made ahead in steps, so that a piece costs a comparison and a copy rather
/// than a string append; when the writer goes, the string is cut back to what was written. Meant
/// for one text written piece by piece: a writer per piece would make room each time.
class JsonTextWriter {
 public:
  explicit JsonTextWriter(std::string& out) noexcept : out_(out), start_(out.size()), at_(start_) {}
  ~JsonTextWriter() { out_.resize(at_); }
  JsonTextWriter(const JsonTextWriter&) = delete;
  JsonTextWriter& operator=(const JsonTextWriter&) = delete;

  JsonTextWriter& operator+=(char c) {
    *room(1) = c;
    ++at_;
    return *this;
  }
  JsonTextWriter& operator+=(std::string_view text) {
    copyBytes(room(text.size()), text.data(), text.size());
    at_ += text.size();
    return *this;
  }
  /// A string, quoted and escaped; invalid UTF-8 replaced by U+FFFD.
  void string(std::string_view text);
  /// A number; "null" for NaN and infinity.
  void number(double value);
  void number(std::int64_t value);
  void number(std::uint64_t value);

 private:
  /// Where `n` more bytes go.
  char* room(std::size_t n) {
    if (out_.size() - at_ < n) grow(n);
    return out_.data() + at_;
  }
  void grow(std::size_t n);

  std::string& out_;
  std::size_t start_;  // where this writer began: the string may hold a long text before it
  std::size_t at_;     // the end of what was written; the string's bytes after it are room
};

}  // namespace kyn::platform
