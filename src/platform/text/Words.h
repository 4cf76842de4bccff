#pragma once

// Short texts read a word at a time: eight bytes in place, without a call. Texts of four to seven
// bytes are read as one word of their first four bytes and their last four (which overlap them);
// short copies are made the same way.

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace kyn::platform {

/// The eight bytes at `at`, as they lie in memory (the first byte lowest on this machine).
inline std::uint64_t word8At(const char* at) noexcept {
  std::uint64_t word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

/// The four bytes at `at`.
inline std::uint32_t word4At(const char* at) noexcept {
  std::uint32_t word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

/// A text of four to seven bytes as one word: its first four bytes low, its last four high.
inline std::uint64_t shortTextWord(const char* text, std::size_t size) noexcept {
  return word4At(text) | (std::uint64_t{word4At(text + size - 4)} << 32);
}

/// Copies `n` bytes to `to`, which does not overlap `from`: up to sixteen as two words that may
/// overlap each other, without the call (and the dispatch on size) of a library copy.
inline void copyBytes(char* to, const char* from, std::size_t n) noexcept {
  if (n > 16) {
    std::memcpy(to, from, n);
  } else if (n >= 8) {
    const std::uint64_t head = word8At(from);
    const std::uint64_t tail = word8At(from + n - 8);
    std::memcpy(to, &head, sizeof head);
    std::memcpy(to + n - 8, &tail, sizeof tail);
  } else if (n >= 4) {
    const std::uint32_t head = word4At(from);
    const std::uint32_t tail = word4At(from + n - 4);
    std::memcpy(to, &head, sizeof head);
    std::memcpy(to + n - 4, &tail, sizeof tail);
  } else {
    for (std::size_t i = 0; i < n; ++i) to[i] = from[i];
  }
}

}  // namespace kyn::platform
