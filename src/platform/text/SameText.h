#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace kyn::platform {

/// `a == b` for short texts (names, keys): eight bytes at a time in place, without a call; the
/// last bytes are read as one word that overlaps the ones before.
inline bool sameText(std::string_view a, std::string_view b) noexcept {
  const std::size_t n = a.size();
  if (n != b.size()) return false;
  const char* p = a.data();
  const char* q = b.data();
  const auto word8 = [](const char* at) {
    std::uint64_t w;
    std::memcpy(&w, at, sizeof w);
    return w;
  };
  const auto word4 = [](const char* at) {
    std::uint32_t w;
    std::memcpy(&w, at, sizeof w);
    return w;
  };
  if (n >= 8) {
    for (std::size_t i = 0; i + 8 < n; i += 8) {
      if (word8(p + i) != word8(q + i)) return false;
    }
    return word8(p + n - 8) == word8(q + n - 8);
  }
  if (n >= 4) return word4(p) == word4(q) && word4(p + n - 4) == word4(q + n - 4);
  // 0 to 3 bytes: the first, the middle and the last cover them all.
  return n == 0 || (p[0] == q[0] && p[n / 2] == q[n / 2] && p[n - 1] == q[n - 1]);
}

}  // namespace kyn::platform
