#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// The user's current locale (the system's, which may differ from the assistant's language).
class LocaleInfo {
 public:
  virtual ~LocaleInfo() = default;
  /// The ICU locale id ("en_US", "de_CH", "fr").
  [[nodiscard]] virtual std::string localeId() const = 0;
  /// The upper-case two-letter country code, or nothing for a locale without a country.
  [[nodiscard]] virtual std::optional<std::string> countryCode() const = 0;
};

/// The lower-case country of the locale, "us" when it names none: where phone numbers without an
/// international prefix are read.
[[nodiscard]] std::string phoneRegionOfLocale(const LocaleInfo& locale);

/// The ICU locale id for texts in `language` (a BCP 47 tag or an ICU id) with the conventions of the
/// region of `systemLocaleId`: "de" on an en_US system gives "de_US" (German words, 12-hour clock,
/// US units). A system locale without a region keeps the language's own; no language gives the
/// system locale's id.
[[nodiscard]] std::string presentationLocaleId(const std::optional<std::string>& language, std::string_view systemLocaleId);

}  // namespace kyn::platform
