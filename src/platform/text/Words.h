#pragma once

// Short texts read a word at a time: eight bytes in place, without a call. Texts of four to seven
// bytes are read as one word of their first four bytes and their last four (which overlap them).

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

}  // namespace kyn::platform
