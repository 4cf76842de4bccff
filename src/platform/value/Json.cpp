#include "platform/value/Json.h"

#include "platform/text/ByteClass.h"
#include "platform/text/SameText.h"
#include "platform/text/StringEscapes.h"
#include "platform/text/Words.h"

#include <simdjson.h>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include <algorithm>
#include <array>
#include <atomic>
#include <bit>
#include <charconv>
#include <cstring>
#include <limits>
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

// A document read by simdjson is kept as simdjson's tape: one 64-bit word per value, its type in
// the top byte; an array or object word holds the index just past its closing word; a number is
// followed by a word holding its bits; a string word holds the offset of its text in the string
// buffer, where a 32-bit length precedes it.

using Document = simdjson::dom::document;

const Document& documentOf(const void* document) noexcept { return *static_cast<const Document*>(document); }

char typeAt(const Document& document, std::size_t index) noexcept {
  return static_cast<char>(document.tape[index] >> 56);
}

/// The index just past the value at `index`.
inline std::size_t after(const Document& document, std::size_t index) noexcept {
  const std::uint64_t word = document.tape[index];
  switch (static_cast<char>(word >> 56)) {
    case '[':
    case '{': return static_cast<std::uint32_t>(word);
    case 'l':
    case 'u':
    case 'd': return index + 2;
    default: return index + 1;
  }
}

/// The index of the closing word of the array or object at `index`.
std::size_t closing(const Document& document, std::size_t index) noexcept {
  return static_cast<std::uint32_t>(document.tape[index]) - 1;
}

/// The number of items or members of the container at `index`.
std::size_t countAt(const Document& document, std::size_t index) noexcept {
  const auto count = static_cast<std::size_t>((document.tape[index] >> 32) & simdjson::internal::JSON_COUNT_MASK);
  if (count < simdjson::internal::JSON_COUNT_MASK) return count;
  // The tape's count saturates: walk.
  const bool object = typeAt(document, index) == '{';
  std::size_t walked = 0;
  const std::size_t end = closing(document, index);
  for (std::size_t i = index + 1; i < end; i = after(document, object ? i + 1 : i)) ++walked;
  return walked;
}

std::string_view stringAt(const Document& document, std::size_t index) noexcept {
  const std::size_t offset = document.tape[index] & simdjson::internal::JSON_VALUE_MASK;
  std::uint32_t length = 0;
  std::memcpy(&length, &document.string_buf[offset], sizeof length);
  return {reinterpret_cast<const char*>(&document.string_buf[offset + sizeof length]), length};
}

template <class T>
T payloadAt(const Document& document, std::size_t index) noexcept {
  T value;
  std::memcpy(&value, &document.tape[index + 1], sizeof value);
  return value;
}

/// Makes the Value of the document's value at `index`: of duplicate keys the last value at the
/// position of the first (`uniqueMembers`), each value made once. Each container is made at its
/// final size.
void convert(const Document& document, std::size_t index, Value& out) {
  switch (typeAt(document, index)) {
    case '[': {
      out = Value::array();
      auto& items = out.get_ref<Value::array_t&>();
      items.reserve(countAt(document, index));
      const std::size_t end = closing(document, index);
      for (std::size_t i = index + 1; i < end; i = after(document, i)) convert(document, i, items.emplace_back());
      return;
    }
    case '{': {
      out = Value::object();
      auto& members = static_cast<Value::object_t::Container&>(out.get_ref<Value::object_t&>());
      const std::vector<JsonEntry> unique = uniqueMembers(JsonView::inDocument(&document, index));
      members.reserve(unique.size());
      for (const auto& [key, value] : unique) members.emplace_back(std::string(key), value.toValue());
      return;
    }
    case '"': out = Value(std::string(stringAt(document, index))); return;
    case 'l': {
      // nlohmann keeps every non-negative integer unsigned.
      const auto v = payloadAt<std::int64_t>(document, index);
      out = v >= 0 ? Value(static_cast<Value::number_unsigned_t>(v)) : Value(static_cast<Value::number_integer_t>(v));
      return;
    }
    case 'u': out = Value(static_cast<Value::number_unsigned_t>(payloadAt<std::uint64_t>(document, index))); return;
    case 'd': out = Value(static_cast<Value::number_float_t>(payloadAt<double>(document, index))); return;
    case 't': out = Value(true); return;
    case 'f': out = Value(false); return;
    default: out = Value(nullptr); return;
  }
}

/// Texts up to this size are read by a kept parser, which keeps its buffers (several bytes per byte
/// of text); a larger one gets a parser of its own, so that one large answer does not
/// hold its memory for good. Keeping it saves nothing measurable at that size.
constexpr std::size_t kKeptParserBytes = 256u * 1024u;
/// simdjson keeps room for this many levels at most; a deeper bound is left to nlohmann's reader.
constexpr std::size_t kMostParserDepth = simdjson::DEFAULT_MAX_DEPTH;

/// Kept objects (parsers, and the storage of documents read by them), lent out one at a time under a
/// lock. Not thread-local: the plug-in may be unloaded while the host's threads live on, and their
/// thread-local storage of an unloaded library is left dangling (the leak checker trips over it).
template <typename T>
class Pool {
 public:
  ~Pool() { closed_.store(true); }

  std::unique_ptr<T> take() {
    if (!closed_.load()) {
      std::lock_guard lock(mutex_);
      if (!idle_.empty()) {
        auto kept = std::move(idle_.back());
        idle_.pop_back();
        return kept;
      }
    }
    return std::make_unique<T>();
  }
  /// A document may outlive the pool, both being statics torn down at exit: then it is freed.
  void giveBack(std::unique_ptr<T> kept) noexcept {
    if (closed_.load()) return;
    std::lock_guard lock(mutex_);
    if (idle_.size() < kKept) idle_.push_back(std::move(kept));  // reserved: never throws
  }
  Pool() { idle_.reserve(kKept); }
  Pool(const Pool&) = delete;
  Pool& operator=(const Pool&) = delete;

 private:
  static constexpr std::size_t kKept = 4;  // a host thread or two and the network threads
  static inline std::atomic<bool> closed_{false};  // trivially destroyed: readable after ~Pool
  std::mutex mutex_;
  std::vector<std::unique_ptr<T>> idle_;
};

Pool<simdjson::dom::parser>& parserPool() {
  static Pool<simdjson::dom::parser> pool;
  return pool;
}

/// Whether simdjson may read the text; else nlohmann's reader decides. Surrogate escapes are left
/// to nlohmann's reader, which refuses every unpaired one; simdjson would copy from the null
/// pointer of an empty text.
bool simdjsonMayRead(std::string_view text) noexcept {
  if (text.empty()) return false;
  for (std::size_t at = text.find("\\u"); at != std::string_view::npos; at = text.find("\\u", at + 2)) {
    if (at + 2 < text.size() && (text[at + 2] == 'd' || text[at + 2] == 'D')) return false;
  }
  return true;
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

namespace {

/// The bytes that go into a JSON string as they are: printable ASCII but the quote and the backslash.
constexpr auto kPlainBytes = byteClass([](unsigned char c) { return c >= 0x20 && c < 0x80 && c != '"' && c != '\\'; });

/// Where a word has a byte that does not go into a JSON string as it is (below 0x20, the quote, the
/// backslash, 0x80 and up): the high bit of each such byte is set. The lowest one set is exact, as a
/// borrow only runs upwards from a byte that is set itself.
constexpr std::uint64_t specialBytes(std::uint64_t w) noexcept {
  constexpr std::uint64_t kOnes = 0x0101010101010101u;
  constexpr std::uint64_t kHighs = 0x8080808080808080u;
  const auto zeroBytes = [](std::uint64_t x) { return (x - kOnes) & ~x & kHighs; };
  const std::uint64_t control = (w - kOnes * 0x20) & ~w & kHighs;
  return control | zeroBytes(w ^ (kOnes * '"')) | zeroBytes(w ^ (kOnes * '\\')) | (w & kHighs);
}

/// How many bytes at the start of `text` go into a JSON string as they are: sixteen at a time with
/// SSE2 (every x86-64 processor has it), else eight, the last ones in a block that overlaps the ones
/// before (which are plain, so the first special byte it shows is the first of the text), without
/// a call.
std::size_t plainPrefix(std::string_view text) noexcept {
  static_assert(std::endian::native == std::endian::little, "the first byte is the lowest");
  const char* const p = text.data();
  const std::size_t n = text.size();
#if defined(__SSE2__)
  if (n >= 16) {
    // A byte below 0x20 or from 0x80 up is below 0x20 as a signed byte.
    const __m128i space = _mm_set1_epi8(0x20);
    const __m128i quote = _mm_set1_epi8('"');
    const __m128i backslash = _mm_set1_epi8('\\');
    const auto specialIn = [&](std::size_t at) {
      const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(p + at));
      const __m128i special =
          _mm_or_si128(_mm_cmplt_epi8(v, space), _mm_or_si128(_mm_cmpeq_epi8(v, quote), _mm_cmpeq_epi8(v, backslash)));
      return static_cast<unsigned>(_mm_movemask_epi8(special));
    };
    for (std::size_t i = 0; i + 16 < n; i += 16) {
      if (const unsigned special = specialIn(i); special != 0) return i + static_cast<std::size_t>(std::countr_zero(special));
    }
    const unsigned special = specialIn(n - 16);
    return special == 0 ? n : n - 16 + static_cast<std::size_t>(std::countr_zero(special));
  }
#endif
  const auto firstIn = [](std::uint64_t special) { return static_cast<std::size_t>(std::countr_zero(special)) / 8; };
  if (n >= 8) {
    for (std::size_t i = 0; i + 8 < n; i += 8) {
      if (const std::uint64_t special = specialBytes(word8At(p + i)); special != 0) return i + firstIn(special);
    }
    const std::uint64_t special = specialBytes(word8At(p + n - 8));
    return special == 0 ? n : n - 8 + firstIn(special);
  }
  if (n >= 4) {
    const std::uint64_t special = specialBytes(shortTextWord(p, n));
    if (special == 0) return n;
    const std::size_t at = firstIn(special);
    return at < 4 ? at : n - 8 + at;
  }
  std::size_t i = 0;
  while (i < n && kPlainBytes[static_cast<unsigned char>(p[i])]) ++i;
  return i;
}

}  // namespace

void JsonTextWriter::grow(std::size_t n) {
  constexpr std::size_t kLeast = 256;
  const std::size_t needed = at_ + n;
  const std::size_t capacity = out_.capacity();
  if (needed > capacity) {
    // As appending would have grown it, but by at least 256 bytes: a description written into an
    // empty string would otherwise be copied over from 15 bytes to 30, 60, 120 and on.
    out_.resize(std::max({needed, 2 * capacity, at_ + kLeast}));
    return;
  }
  // Within the capacity: room for as much again as this writer has written (at least 256 bytes),
  // so that the bytes cleared ahead stay in proportion to those written. A short text clears little
  // of a large reserve, and a record written at the end of a long text (a log line that describes
  // many) does not clear room for the whole text again.
  out_.resize(std::min(capacity, std::max(needed, at_ + std::max(at_ - start_, kLeast))));
}

void JsonTextWriter::string(std::string_view text) {
  // Most texts are plain ASCII: copied in one step. Of the others, the plain start is not looked
  // at again. Room is made for the worst case of the rest: every byte written as \u00XX.
  const std::size_t plain = plainPrefix(text);
  char* const start = room(plain + 6 * (text.size() - plain) + 2);
  char* p = start;
  *p++ = '"';
  copyBytes(p, text.data(), plain);
  p += plain;
  bool checked = false;  // the whole text has been found to be valid UTF-8
  for (std::size_t i = plain; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (kPlainBytes[c]) {
      *p++ = static_cast<char>(c);
      continue;
    }
    if (c >= 0x80) {
      if (!checked && !isValidUtf8(text.substr(i))) {
        // Rare: the library's own writer decides how each bad byte is replaced.
        *this += Value(std::string(text)).dump(-1, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace);
        return;
      }
      checked = true;
      *p++ = static_cast<char>(c);
      continue;
    }
    *p++ = '\\';
    switch (c) {
      case '"': *p++ = '"'; break;
      case '\\': *p++ = '\\'; break;
      case '\b': *p++ = 'b'; break;
      case '\f': *p++ = 'f'; break;
      case '\n': *p++ = 'n'; break;
      case '\r': *p++ = 'r'; break;
      case '\t': *p++ = 't'; break;
      default: {
        static constexpr char kHex[] = "0123456789abcdef";
        const char escaped[] = {'u', '0', '0', kHex[c >> 4], kHex[c & 0xF]};
        p = std::copy(escaped, escaped + sizeof escaped, p);
      }
    }
  }
  *p++ = '"';
  at_ += static_cast<std::size_t>(p - start);
}

namespace {

/// "00" to "99".
constexpr auto kDigitPairs = [] {
  std::array<char, 200> pairs{};
  for (int i = 0; i < 100; ++i) {
    pairs[2 * i] = static_cast<char>('0' + i / 10);
    pairs[2 * i + 1] = static_cast<char>('0' + i % 10);
  }
  return pairs;
}();

/// The decimal `digits` / 10^Places of a double: whole part, point, then the fraction without
/// its trailing zeros ("30.0", "0.0125"). The fraction is written two digits at a time; the
/// divisions are by constants, which compile to multiplications.
template <int Places>
char* writeScaled(char* p, std::uint64_t digits) noexcept {
  static_assert(Places % 2 == 0);
  constexpr std::uint64_t kUnit = [] {
    std::uint64_t unit = 1;
    for (int i = 0; i < Places; ++i) unit *= 10;
    return unit;
  }();
  p = std::to_chars(p, p + 20, digits / kUnit).ptr;
  *p++ = '.';
  auto fraction = static_cast<std::uint32_t>(digits % kUnit);
  if (fraction == 0) {
    *p++ = '0';
    return p;
  }
  for (int i = Places - 2; i >= 0; i -= 2) {
    std::memcpy(p + i, &kDigitPairs[2 * (fraction % 100)], 2);
    fraction /= 100;
  }
  p += Places;
  while (p[-1] == '0') --p;  // the fraction is not 0: a digit other than 0 ends the loop
  return p;
}

/// Writes `value` when it is a short decimal, as coordinates, distances and times in seconds are:
/// at most 8 decimals below 2^24, at most 6 below 2^31, and not below 1e-4. Its digits times a power
/// of ten then give it back exactly, and no other decimal of as many places gives the same double
/// (their spacing is over twice the double's), so they are its shortest form, written as the library
/// writes numbers of that size ("12.5", "30.0"). Nothing for any other value.
char* writeShortDecimal(char* out, double value) noexcept {
  const double magnitude = std::fabs(value);
  const bool small = magnitude < 16777216.0;
  if (magnitude < 1e-4 || magnitude >= 2147483648.0) return nullptr;
  const double scale = small ? 1e8 : 1e6;
  // Rounded to the nearest integer by adding a half and truncating, without a library call. The
  // sum is exact unless the product lies half an integer away from one, and such a value is no
  // short decimal: the check below turns it away whichever way it rounds.
  const auto digits = static_cast<std::uint64_t>(magnitude * scale + 0.5);
  if (static_cast<double>(digits) / scale != magnitude) return nullptr;
  if (value < 0) *out++ = '-';
  return small ? writeScaled<8>(out, digits) : writeScaled<6>(out, digits);
}

}  // namespace

void JsonTextWriter::number(double value) {
  if (!std::isfinite(value)) {
    *this += "null";
    return;
  }
  constexpr std::size_t kMost = 32;  // the longest form is "-2.2250738585072014e-308", 24 bytes
  char* const start = room(kMost);
  const char* end = writeShortDecimal(start, value);
  // Otherwise the library's own shortest form, the one `toJson` writes.
  if (end == nullptr) end = nlohmann::detail::to_chars(start, start + kMost, value);
  at_ += static_cast<std::size_t>(end - start);
}

void JsonTextWriter::number(std::int64_t value) {
  constexpr std::size_t kMost = 20;
  char* const start = room(kMost);
  at_ += static_cast<std::size_t>(std::to_chars(start, start + kMost, value).ptr - start);
}

void JsonTextWriter::number(std::uint64_t value) {
  constexpr std::size_t kMost = 20;
  char* const start = room(kMost);
  at_ += static_cast<std::size_t>(std::to_chars(start, start + kMost, value).ptr - start);
}

struct JsonDocument::Storage {
  Document document;  // what simdjson read
  Value value;        // the tree of a text that simdjson did not read
  Storage() = default;
  Storage(const Storage&) = delete;
  Storage& operator=(const Storage&) = delete;
  ~Storage() { releaseValue(value); }
};

namespace {

/// Documents of texts up to this size keep their buffers (about ten bytes per byte of text) for the
/// next text, which saves allocating and freeing them on every reading.
constexpr std::size_t kKeptDocumentBytes = 64u * 1024u;

Pool<JsonDocument::Storage>& storagePool() {
  static Pool<JsonDocument::Storage> pool;
  return pool;
}

}  // namespace

JsonDocument::JsonDocument() noexcept = default;
JsonDocument::~JsonDocument() {
  if (storage_ && storage_->value.is_null() && storage_->document.capacity() <= kKeptDocumentBytes) {
    storagePool().giveBack(std::move(storage_));
  }
}
JsonDocument::JsonDocument(JsonDocument&& other) noexcept = default;
// The old storage leaves with `other`, whose destructor keeps it for the next reading.
JsonDocument& JsonDocument::operator=(JsonDocument&& other) noexcept {
  std::swap(storage_, other.storage_);
  std::swap(root_, other.root_);
  return *this;
}

// With `padded`, the text is followed by room that simdjson may read, and it reads the text where
// it is instead of copying it first.
std::optional<JsonDocument> JsonDocument::read(std::string_view text, const JsonLimits& limits, bool padded) noexcept {
  if (text.size() > limits.maxBytes) return std::nullopt;
  // nlohmann's lexer takes a NUL byte for the end of the input and would ignore whatever follows
  // it; a raw NUL is valid nowhere in JSON, so such a text is refused outright.
  if (text.find('\0') != std::string_view::npos) return std::nullopt;
  try {
    JsonDocument document;
    document.storage_ = storagePool().take();
    JsonDocument::Storage& storage = *document.storage_;
    if (simdjsonMayRead(text)) {
      // simdjson reads several times faster than nlohmann's reader; what it refuses, nlohmann's decides.
      // The parser is lent only for the reading: the document keeps what it read, sized to the text.
      // It refuses every number that does not fit a double. Set to the depth bound, it refuses a
      // non-empty container at that depth (an empty one is no level to it): what it reads stays
      // within the bound, and a text at the bound is left to nlohmann's reader, which decides.
      const bool keep = text.size() <= kKeptParserBytes;
      auto parser = keep ? parserPool().take() : std::make_unique<simdjson::dom::parser>();
      const std::size_t depth = std::min(limits.maxDepth, kMostParserDepth);
      simdjson::dom::element root;
      // A bound of 0 is left to nlohmann's reader: simdjson needs room for the root's level.
      const bool read =
          depth > 0 &&
          (parser->max_depth() == depth ||
           parser->allocate(std::max(parser->capacity(), text.size()), depth) == simdjson::SUCCESS) &&
          parser->parse_into_document(storage.document, text.data(), text.size(), /*realloc_if_needed=*/!padded)
                  .get(root) == simdjson::SUCCESS;
      if (keep) parserPool().giveBack(std::move(parser));
      if (read) {
        document.root_ = JsonView::inDocument(&storage.document, 1);  // the root word comes first
        return document;
      }
    }
    Builder builder(limits.maxDepth);
    const bool ok = Value::sax_parse(text.begin(), text.end(), &builder, Value::input_format_t::json,
                                     /*strict=*/true, /*ignore_comments=*/false);
    if (!ok) return std::nullopt;
    storage.value = builder.take();
    document.root_ = JsonView(&storage.value);
    return document;
  } catch (...) {
    return std::nullopt;
  }
}

std::optional<JsonDocument> parseJsonDocument(std::string_view text, const JsonLimits& limits) noexcept {
  return JsonDocument::read(text, limits, /*padded=*/false);
}

std::optional<JsonDocument> parseJsonDocumentInPlace(std::string& text, const JsonLimits& limits) noexcept {
  try {
    // The room is written once, so that what simdjson reads there has a value.
    const std::size_t size = text.size();
    text.append(simdjson::SIMDJSON_PADDING, ' ');
    text.resize(size);
  } catch (...) {
    return JsonDocument::read(text, limits, /*padded=*/false);
  }
  return JsonDocument::read(text, limits, /*padded=*/true);
}

std::optional<Value> parseJson(std::string_view text, const JsonLimits& limits) noexcept {
  try {
    auto document = parseJsonDocument(text, limits);
    if (!document) return std::nullopt;
    // A text that nlohmann's reader read is a tree already and moves out whole; a null tree is null
    // either way.
    if (Value& tree = document->storage_->value; !tree.is_null()) return std::move(tree);
    return document->root().toValue();
  } catch (...) {
    return std::nullopt;
  }
}

// ---- JsonView ----

namespace {
/// A number as a value holds it.
struct Number {
  enum class Kind : std::uint8_t { None, Signed, Unsigned, Real } kind = Kind::None;
  std::int64_t i = 0;
  std::uint64_t u = 0;
  double d = 0.0;
};
}  // namespace

struct JsonViewAccess {
  static Number number(const JsonView& view) noexcept {
    Number n;
    if (view.kind_ == JsonView::Kind::Tree) {
      const Value& v = view.tree();
      if (v.is_number_unsigned()) {
        n.kind = Number::Kind::Unsigned;
        n.u = v.get<std::uint64_t>();
      } else if (v.is_number_integer()) {
        n.kind = Number::Kind::Signed;
        n.i = v.get<std::int64_t>();
      } else if (v.is_number_float()) {
        n.kind = Number::Kind::Real;
        n.d = v.get<double>();
      }
    } else if (view.kind_ == JsonView::Kind::Document) {
      const Document& document = documentOf(view.ptr_);
      switch (typeAt(document, view.index_)) {
        case 'l':
          n.kind = Number::Kind::Signed;
          n.i = payloadAt<std::int64_t>(document, view.index_);
          break;
        case 'u':
          n.kind = Number::Kind::Unsigned;
          n.u = payloadAt<std::uint64_t>(document, view.index_);
          break;
        case 'd':
          n.kind = Number::Kind::Real;
          n.d = payloadAt<double>(document, view.index_);
          break;
        default: break;
      }
    }
    return n;
  }

  static char type(const JsonView& view) noexcept {
    if (view.kind_ == JsonView::Kind::Document) return typeAt(documentOf(view.ptr_), view.index_);
    if (view.kind_ == JsonView::Kind::Absent) return '\0';
    switch (view.tree().type()) {
      case Value::value_t::null: return 'n';
      case Value::value_t::boolean: return view.tree().get<bool>() ? 't' : 'f';
      case Value::value_t::string: return '"';
      case Value::value_t::array: return '[';
      case Value::value_t::object: return '{';
      case Value::value_t::number_float: return 'd';
      case Value::value_t::number_unsigned: return 'u';
      case Value::value_t::number_integer: return 'l';
      default: return '\0';
    }
  }

  static const Value* tree(const JsonView& view) noexcept {
    return view.kind_ == JsonView::Kind::Tree ? &view.tree() : nullptr;
  }
  static const Document& document(const JsonView& view) noexcept { return documentOf(view.ptr_); }
  static std::size_t index(const JsonView& view) noexcept { return view.index_; }
};

namespace {
char typeOf(const JsonView& view) noexcept { return JsonViewAccess::type(view); }
}  // namespace

bool JsonView::isNull() const noexcept { return typeOf(*this) == 'n'; }
bool JsonView::isBool() const noexcept {
  const char t = typeOf(*this);
  return t == 't' || t == 'f';
}
bool JsonView::isNumber() const noexcept {
  const char t = typeOf(*this);
  return t == 'l' || t == 'u' || t == 'd';
}
bool JsonView::isInteger() const noexcept {
  const char t = typeOf(*this);
  return t == 'l' || t == 'u';
}
bool JsonView::isString() const noexcept { return typeOf(*this) == '"'; }
bool JsonView::isArray() const noexcept { return typeOf(*this) == '['; }
bool JsonView::isObject() const noexcept { return typeOf(*this) == '{'; }

namespace {
/// Calls `visit(name, index of the value)` for each member of the object at `index`, in order.
template <class Visit>
void forEachMember(const Document& document, std::size_t index, Visit&& visit) noexcept {
  const std::size_t end = closing(document, index);
  for (std::size_t i = index + 1; i < end; i = after(document, i + 1)) visit(stringAt(document, i), i + 1);
}
}  // namespace

JsonView JsonView::member(std::string_view key) const noexcept {
  if (kind_ == Kind::Tree) return platform::member(&tree(), key);
  if (kind_ != Kind::Document || typeAt(documentOf(ptr_), index_) != '{') return {};
  JsonView found;
  forEachMember(documentOf(ptr_), index_, [&](std::string_view name, std::size_t at) {
    if (sameText(name, key)) found = inDocument(ptr_, at);  // the last one wins
  });
  return found;
}

void JsonView::members(std::span<const std::string_view> keys, std::span<JsonView> found) const noexcept {
  const std::size_t count = std::min(keys.size(), found.size());
  for (std::size_t k = 0; k < count; ++k) found[k] = JsonView();
  if (kind_ == Kind::Tree) {
    for (std::size_t k = 0; k < count; ++k) found[k] = platform::member(&tree(), keys[k]);
    return;
  }
  if (kind_ != Kind::Document || typeAt(documentOf(ptr_), index_) != '{') return;
  forEachMember(documentOf(ptr_), index_, [&](std::string_view name, std::size_t at) {
    for (std::size_t k = 0; k < count; ++k) {
      if (sameText(name, keys[k])) {
        found[k] = inDocument(ptr_, at);  // the last one wins
        break;
      }
    }
  });
}

JsonView JsonView::memberNotNull(std::string_view key) const noexcept {
  JsonView found = member(key);
  return found.isNull() ? JsonView() : found;
}

std::optional<std::string_view> JsonView::string() const noexcept {
  if (kind_ == Kind::Tree) {
    if (!tree().is_string()) return std::nullopt;
    return std::string_view(tree().get_ref<const std::string&>());
  }
  if (kind_ == Kind::Document && typeAt(documentOf(ptr_), index_) == '"') return stringAt(documentOf(ptr_), index_);
  return std::nullopt;
}

std::size_t JsonView::size() const noexcept {
  if (kind_ == Kind::Tree) return tree().is_structured() ? tree().size() : 0;
  if (kind_ == Kind::Document && (isArray() || isObject())) return countAt(documentOf(ptr_), index_);
  return 0;
}

Value JsonView::toValue() const {
  if (kind_ == Kind::Tree) return tree();
  Value out;
  if (kind_ == Kind::Document) convert(documentOf(ptr_), index_, out);
  return out;
}

JsonView::Iterator JsonView::iteratorAt(bool atEnd) const noexcept {
  Iterator it;
  it.container_ = ptr_;
  it.document_ = kind_ == Kind::Document;
  const char type = typeOf(*this);  // read once: the type word is what makes a walk cost
  it.object_ = type == '{';
  if (it.document_ && (type == '{' || type == '[')) it.at_ = atEnd ? closing(documentOf(ptr_), index_) : index_ + 1;
  if (atEnd && kind_ == Kind::Tree && tree().is_structured()) it.at_ = tree().size();
  return it;
}

JsonView::Iterator JsonView::begin() const noexcept { return iteratorAt(false); }
JsonView::Iterator JsonView::end() const noexcept { return iteratorAt(true); }

JsonView::Entry JsonView::Iterator::operator*() const noexcept {
  if (!document_) {
    const Value& v = *static_cast<const Value*>(container_);
    if (!object_) return {{}, &v.get_ref<const Value::array_t&>()[at_]};
    const auto& members = static_cast<const Value::object_t::Container&>(v.get_ref<const Value::object_t&>());
    return {members[at_].first, &members[at_].second};
  }
  if (!object_) return {{}, inDocument(container_, at_)};
  return {stringAt(documentOf(container_), at_), inDocument(container_, at_ + 1)};
}

JsonView::Iterator& JsonView::Iterator::operator++() noexcept {
  if (!document_) {
    ++at_;
  } else {
    at_ = after(documentOf(container_), object_ ? at_ + 1 : at_);
  }
  return *this;
}

std::vector<JsonEntry> uniqueMembers(JsonView object) {
  std::vector<JsonEntry> out;
  if (!object.isObject()) return out;
  const std::size_t size = object.size();
  out.reserve(size);
  std::unordered_map<std::string_view, std::size_t> keys;  // for large objects only
  for (const JsonEntry& entry : object) {
    std::size_t at = out.size();
    if (size > kIndexThreshold) {
      at = keys.emplace(entry.key, at).first->second;
    } else {
      for (std::size_t m = 0; m < out.size(); ++m) {
        if (sameText(out[m].key, entry.key)) {
          at = m;
          break;
        }
      }
    }
    if (at == out.size()) out.push_back(entry);
    else out[at].value = entry.value;
  }
  return out;
}

// ---- Readers ----

std::optional<std::string> stringValue(JsonView value) {
  const auto text = value.string();
  if (!text) return std::nullopt;
  return std::string(*text);
}

void setStringValue(std::optional<std::string>& into, JsonView value) {
  if (const auto text = value.string()) {
    into.emplace(*text);
  } else {
    into.reset();
  }
}

std::optional<double> numberValue(JsonView value) noexcept {
  const Number n = JsonViewAccess::number(value);
  switch (n.kind) {
    case Number::Kind::Signed: return static_cast<double>(n.i);
    case Number::Kind::Unsigned: return static_cast<double>(n.u);
    case Number::Kind::Real: return n.d;
    case Number::Kind::None: break;
  }
  return std::nullopt;
}

std::optional<bool> boolValue(JsonView value) noexcept {
  const char t = typeOf(value);
  if (t == 't') return true;
  if (t == 'f') return false;
  if (const auto n = numberValue(value)) return *n != 0.0;
  return std::nullopt;
}

std::int64_t integerValue(JsonView value) noexcept {
  const Number n = JsonViewAccess::number(value);
  switch (n.kind) {
    case Number::Kind::Signed: return n.i;
    case Number::Kind::Unsigned:
      return n.u > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())
                 ? std::numeric_limits<std::int64_t>::max()
                 : static_cast<std::int64_t>(n.u);
    case Number::Kind::Real:
      if (std::isnan(n.d)) return 0;
      if (n.d >= 9.2233720368547758e18) return std::numeric_limits<std::int64_t>::max();
      if (n.d <= -9.2233720368547758e18) return std::numeric_limits<std::int64_t>::min();
      return static_cast<std::int64_t>(n.d);
    case Number::Kind::None: break;
  }
  const char t = typeOf(value);
  if (t == 't') return 1;
  if (t == 'f') return 0;
  if (const auto text = value.string()) return leadingInteger64(*text);
  return 0;
}

std::int32_t int32Value(JsonView value) noexcept {
  if (const auto text = value.string()) return leadingInteger32(*text);
  // Modular narrowing, as a number object's 32-bit accessor does.
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(static_cast<std::uint64_t>(integerValue(value))));
}

namespace {
// A tree written as compact JSON, as the library writes it (numbers sometimes in fewer digits),
// without its writer's set-up per call.
void appendTree(JsonTextWriter& out, const Value& value) {
  switch (value.type()) {
    case Value::value_t::object: {
      out += '{';
      bool first = true;
      for (const auto& [key, item] : value.items()) {
        if (!std::exchange(first, false)) out += ',';
        out.string(key);
        out += ':';
        appendTree(out, item);
      }
      out += '}';
      return;
    }
    case Value::value_t::array: {
      out += '[';
      bool first = true;
      for (const Value& item : value) {
        if (!std::exchange(first, false)) out += ',';
        appendTree(out, item);
      }
      out += ']';
      return;
    }
    case Value::value_t::string: out.string(value.get_ref<const std::string&>()); return;
    case Value::value_t::boolean: out += value.get<bool>() ? "true" : "false"; return;
    case Value::value_t::number_integer: out.number(value.get<std::int64_t>()); return;
    case Value::value_t::number_unsigned: out.number(value.get<std::uint64_t>()); return;
    case Value::value_t::number_float: out.number(value.get<double>()); return;
    case Value::value_t::null: out += "null"; return;
    default: out += value.dump(-1, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace); return;
  }
}
}  // namespace

std::string toJson(const Value& value, int indent) noexcept {
  try {
    if (indent >= 0) return value.dump(indent, ' ', /*ensure_ascii=*/false, Value::error_handler_t::replace);
    std::string out;
    {
      JsonTextWriter writer(out);
      appendTree(writer, value);
    }
    return out;
  } catch (...) {
    return "null";
  }
}

namespace {
// A document's value written as compact JSON in document order, without building a tree (the raw
// answers are logged per command). A repeated key is written as often as it came. One pass over
// the tape: each word is a value, a key or a container's end, and what goes before it (a comma, a
// colon, nothing) follows from the container it is in and what that container has had so far.
void appendTape(JsonTextWriter& out, const Document& document, std::size_t index) {
  const std::size_t end = after(document, index);
  // Per open container: kObject, kStarted once it holds something, kValueNext after a key.
  enum : std::uint8_t { kObject = 1, kStarted = 2, kValueNext = 4 };
  std::vector<std::uint8_t> open;
  for (std::size_t i = index; i < end;) {
    const char type = typeAt(document, i);
    if (type == '}' || type == ']') {
      out += type;
      open.pop_back();
      ++i;
      continue;
    }
    if (!open.empty()) {
      std::uint8_t& state = open.back();
      if ((state & kValueNext) != 0) {
        out += ':';
        state &= ~kValueNext;
      } else {
        if ((state & kStarted) != 0) out += ',';
        state |= kStarted;
        if ((state & kObject) != 0) state |= kValueNext;  // this word is a key
      }
    }
    switch (type) {
      case '{':
      case '[':
        out += type;
        open.push_back(type == '{' ? kObject : 0);
        ++i;
        continue;
      case '"': out.string(stringAt(document, i)); break;
      case 't': out += "true"; break;
      case 'f': out += "false"; break;
      case 'l': out.number(payloadAt<std::int64_t>(document, i)); break;
      case 'u': out.number(payloadAt<std::uint64_t>(document, i)); break;
      case 'd': out.number(payloadAt<double>(document, i)); break;
      default: out += "null"; break;
    }
    i = after(document, i);
  }
}
}  // namespace

std::string toJson(JsonView value, int indent) noexcept {
  if (const Value* tree = JsonViewAccess::tree(value)) return toJson(*tree, indent);
  try {
    if (indent >= 0 || !value) return toJson(value.toValue(), indent);
    std::string out;
    {
      JsonTextWriter writer(out);
      appendTape(writer, JsonViewAccess::document(value), JsonViewAccess::index(value));
    }
    return out;
  } catch (...) {
    return "null";
  }
}

}  // namespace kyn::platform
