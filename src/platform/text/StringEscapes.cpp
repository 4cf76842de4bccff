#include "platform/text/StringEscapes.h"

#include "platform/text/ByteClass.h"

#include <array>
#include <charconv>
#include <cmath>
#include <limits>

namespace kyn::platform {
namespace {

constexpr bool isUnreserved(unsigned char c) noexcept {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

constexpr int hexDigit(char c) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  return -1;
}

constexpr bool isDigit(char c) noexcept { return c >= '0' && c <= '9'; }

template <class Int>
Int leadingInteger(std::string_view text) noexcept {
  std::size_t i = 0;
  while (i < text.size() && (text[i] == ' ' || text[i] == '\t' || text[i] == '\n' || text[i] == '\r' ||
                             text[i] == '\v' || text[i] == '\f')) {
    ++i;
  }
  bool negative = false;
  if (i < text.size() && (text[i] == '+' || text[i] == '-')) {
    negative = text[i] == '-';
    ++i;
  }
  // Accumulate toward the sign so that the most negative value is reachable.
  Int result = 0;
  constexpr Int max = std::numeric_limits<Int>::max();
  constexpr Int min = std::numeric_limits<Int>::min();
  for (; i < text.size() && isDigit(text[i]); ++i) {
    const Int d = static_cast<Int>(text[i] - '0');
    if (negative) {
      if (result < (min + d) / 10) return min;
      result = static_cast<Int>(result * 10 - d);
    } else {
      if (result > (max - d) / 10) return max;
      result = static_cast<Int>(result * 10 + d);
    }
  }
  return result;
}

}  // namespace

void appendPercentEscaped(std::string& out, std::string_view text) {
  static constexpr char kHex[] = "0123456789ABCDEF";
  static constexpr auto kUnreserved = byteClass(isUnreserved);
  std::size_t i = 0;
  while (i < text.size()) {
    std::size_t run = i;
    while (run < text.size() && kUnreserved[static_cast<unsigned char>(text[run])]) ++run;
    out.append(text.data() + i, run - i);
    if (run == text.size()) break;
    const auto c = static_cast<unsigned char>(text[run]);
    const char escaped[3] = {'%', kHex[c >> 4], kHex[c & 0x0F]};
    out.append(escaped, 3);
    i = run + 1;
  }
}

std::string encodeToPercentEscape(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  appendPercentEscaped(out, text);
  return out;
}

std::optional<std::string> decodeFromPercentEscape(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '%') {
      out.push_back(text[i]);
      continue;
    }
    if (i + 2 >= text.size()) return std::nullopt;  // fewer than two characters follow
    const int hi = hexDigit(text[i + 1]);
    const int lo = hexDigit(text[i + 2]);
    if (hi < 0 || lo < 0) return std::nullopt;
    out.push_back(static_cast<char>((hi << 4) | lo));
    i += 2;
  }
  if (!isValidUtf8(out)) return std::nullopt;
  return out;
}

bool isNumeric(std::string_view text) noexcept {
  std::size_t i = 0;
  if (i < text.size() && (text[i] == '+' || text[i] == '-')) ++i;
  std::size_t digits = 0;
  while (i < text.size() && isDigit(text[i])) ++i, ++digits;
  if (i < text.size() && text[i] == '.') {
    ++i;
    while (i < text.size() && isDigit(text[i])) ++i, ++digits;
  }
  if (digits == 0) return false;
  if (i < text.size() && (text[i] == 'e' || text[i] == 'E')) {
    ++i;
    if (i < text.size() && (text[i] == '+' || text[i] == '-')) ++i;
    std::size_t expDigits = 0;
    while (i < text.size() && isDigit(text[i])) ++i, ++expDigits;
    if (expDigits == 0) return false;
  }
  return i == text.size();
}

std::int32_t leadingInteger32(std::string_view text) noexcept { return leadingInteger<std::int32_t>(text); }
std::int64_t leadingInteger64(std::string_view text) noexcept { return leadingInteger<std::int64_t>(text); }

std::string numberDescription(double value) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value < 0 ? "-inf" : "inf";
  if (value == 0.0) return "0";
  std::array<char, 64> buffer{};
  if (std::trunc(value) == value && std::fabs(value) < 1e17) {
    auto [end, ec] = std::to_chars(buffer.data(), buffer.data() + buffer.size(), static_cast<long long>(value));
    if (ec == std::errc()) return std::string(buffer.data(), end);
  }
  auto [end, ec] = std::to_chars(buffer.data(), buffer.data() + buffer.size(), value);
  if (ec != std::errc()) return "0";
  return std::string(buffer.data(), end);
}

bool isValidUtf8(std::string_view text) noexcept {
  std::size_t i = 0;
  const std::size_t n = text.size();
  while (i < n) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (c < 0x80) {
      ++i;
      continue;
    }
    std::size_t len = 0;
    std::uint32_t cp = 0;
    if ((c & 0xE0) == 0xC0) {
      len = 2;
      cp = c & 0x1F;
    } else if ((c & 0xF0) == 0xE0) {
      len = 3;
      cp = c & 0x0F;
    } else if ((c & 0xF8) == 0xF0) {
      len = 4;
      cp = c & 0x07;
    } else {
      return false;
    }
    if (i + len > n) return false;
    for (std::size_t k = 1; k < len; ++k) {
      const auto cc = static_cast<unsigned char>(text[i + k]);
      if ((cc & 0xC0) != 0x80) return false;
      cp = (cp << 6) | (cc & 0x3F);
    }
    if ((len == 2 && cp < 0x80) || (len == 3 && cp < 0x800) || (len == 4 && cp < 0x10000)) return false;
    if (cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return false;
    i += len;
  }
  return true;
}

}  // namespace kyn::platform
