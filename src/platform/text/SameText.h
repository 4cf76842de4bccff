#pragma once

#include "platform/text/Words.h"

#include <cstddef>
#include <string_view>

namespace kyn::platform {

/// `a == b` for short texts (names, keys): eight bytes at a time in place, without a call; the
/// last bytes are read as one word that overlaps the ones before.
inline bool sameText(std::string_view a, std::string_view b) noexcept {
  const std::size_t n = a.size();
  if (n != b.size()) return false;
  const char* p = a.data();
  const char* q = b.data();
  if (n >= 8) {
    for (std::size_t i = 0; i + 8 < n; i += 8) {
      if (word8At(p + i) != word8At(q + i)) return false;
    }
    return word8At(p + n - 8) == word8At(q + n - 8);
  }
  if (n >= 4) return word4At(p) == word4At(q) && word4At(p + n - 4) == word4At(q + n - 4);
  // 0 to 3 bytes: the first, the middle and the last cover them all.
  return n == 0 || (p[0] == q[0] && p[n / 2] == q[n / 2] && p[n - 1] == q[n - 1]);
}

}  // namespace kyn::platform
