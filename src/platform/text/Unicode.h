#pragma once

// Unicode operations on UTF-8 text (ICU underneath). Invalid UTF-8 never throws: an ill-formed
// sequence reads as U+FFFD.

#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// True for every decimal digit of Unicode (general category Nd), not only 0-9.
[[nodiscard]] bool isDecimalDigit(char32_t c) noexcept;

/// The text folded for caseless comparison (full Unicode case folding; "Straße" and "STRASSE" fold
/// alike). Ill-formed sequences become U+FFFD.
[[nodiscard]] std::string foldCase(std::string_view text);

/// The text from the first code point that `accept` takes to the end, the start moved back to the
/// beginning of that character's grapheme cluster (so a base character and its combining marks stay
/// together). Nothing when no code point is accepted.
[[nodiscard]] std::optional<std::string> suffixFromFirstMatch(std::string_view text,
                                                              const std::function<bool(char32_t)>& accept);

/// The code points that `keep` takes, in order; everything else is dropped.
[[nodiscard]] std::string keepCodePoints(std::string_view text, const std::function<bool(char32_t)>& keep);

}  // namespace kyn::platform
