#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// How a phone number is written: 1 for display (international format, "+1 408-555-0100"),
/// 2 canonical (E.164, "+14085550100": one stable text per number).
enum class PhoneNumberStyle : int { Display = 1, Canonical = 2 };

/// Reads `text` as a phone number of `region` (a lower-case two-letter country code; an empty
/// region reads only numbers written with their international prefix) and writes it in `style`.
/// Nothing when the text is no phone number, or a number whose length is impossible for its country
/// ("12", seventeen digits). The canonical text of a canonical text is itself. Thread-safe.
[[nodiscard]] std::optional<std::string> formatPhoneNumber(std::string_view text, std::string_view region,
                                                           PhoneNumberStyle style);

}  // namespace kyn::platform
