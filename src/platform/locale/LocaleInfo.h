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

/// The process's ICU default locale (from LANG and friends), or the locale named.
class IcuLocaleInfo final : public LocaleInfo {
 public:
  explicit IcuLocaleInfo(std::optional<std::string> localeId = std::nullopt);
  std::string localeId() const override { return id_; }
  std::optional<std::string> countryCode() const override { return country_; }

 private:
  std::string id_;
  std::optional<std::string> country_;
};

/// The ICU locale id for texts in `language` (a BCP 47 tag or an ICU id) with the conventions of the
/// region of `systemLocaleId`: "de" on an en_US system gives "de_US" (German words, 12-hour clock,
/// US units). A system locale without a region keeps the language's own; no language gives the
/// system locale's id.
[[nodiscard]] std::string presentationLocaleId(const std::optional<std::string>& language, std::string_view systemLocaleId);

/// The lower-case country of the locale, "us" when it names none: where phone numbers without an
/// international prefix are read.
[[nodiscard]] std::string phoneRegionOfLocale(const LocaleInfo& locale);

}  // namespace kyn::platform
