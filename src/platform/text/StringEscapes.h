#pragma once

// String operations of the support library: percent escaping for URL queries, the numeric test and
// the leading-integer reading that number objects use, and the text of a number.

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// Percent-escapes every byte except the unreserved characters A-Z a-z 0-9 - . _ ~, so that the result
/// can stand as a key or a value in a URL query ("&", "=", "%", "+", blanks and non-ASCII included).
[[nodiscard]] std::string encodeToPercentEscape(std::string_view text);
/// `encodeToPercentEscape(text)` appended to `out`.
void appendPercentEscaped(std::string& out, std::string_view text);

/// The exact inverse of `encodeToPercentEscape`: decodes every %XX. Nothing for a broken escape
/// ("%", "%4", "%zz") or when the decoded bytes are not valid UTF-8.
[[nodiscard]] std::optional<std::string> decodeFromPercentEscape(std::string_view text);

/// True when the whole text is one decimal number: optional sign, digits with an optional fraction,
/// optional exponent (ASCII only, no blanks).
[[nodiscard]] bool isNumeric(std::string_view text) noexcept;

/// The text's leading integer as a number object reads it: leading blanks skipped, an optional sign,
/// then digits; anything after them is ignored; no digits read as 0. Saturates at the type's limits.
[[nodiscard]] std::int32_t leadingInteger32(std::string_view text) noexcept;
[[nodiscard]] std::int64_t leadingInteger64(std::string_view text) noexcept;

/// The shortest decimal text that reads back as the same double ("3.5", "42", "1e+20").
[[nodiscard]] std::string numberDescription(double value);

/// True when the bytes are well-formed UTF-8.
[[nodiscard]] bool isValidUtf8(std::string_view text) noexcept;

}  // namespace kyn::platform
