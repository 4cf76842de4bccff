#pragma once

#include <array>
#include <cstddef>

namespace kyn::platform {

/// The bytes for which `member(byte)` holds, as a table: text is then scanned with one look-up per
/// byte. Made when compiling.
template <class Member>
constexpr std::array<bool, 256> byteClass(Member member) {
  std::array<bool, 256> table{};
  for (int c = 0; c < 256; ++c) table[static_cast<std::size_t>(c)] = member(static_cast<unsigned char>(c));
  return table;
}

}  // namespace kyn::platform
