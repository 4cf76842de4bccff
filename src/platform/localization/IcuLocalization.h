#pragma once

// The string tables and number formats of ICU.

#include "platform/localization/Localization.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// The string tables compiled into the plug-in as ICU resource bundles. The language is given per
/// call; the process's default locale plays no part in the fallback.
class IcuLocalization final : public Localization {
 public:
  IcuLocalization();
  std::string localizedString(std::string_view key, std::string_view language) const override;
};

/// Turns a language code ("en-US", "de_CH", "fr") into an ICU locale id ("en_US", "de_CH", "fr").
[[nodiscard]] std::string icuLocaleId(std::string_view language);

/// ICU number formats for one locale (the process's default locale unless one is named), built once.
class IcuNumberFormatting final : public NumberFormatting {
 public:
  explicit IcuNumberFormatting(std::optional<std::string> localeId = std::nullopt);
  ~IcuNumberFormatting() override;
  std::string integerText(std::uint64_t value) const override;
  std::optional<double> parseDecimal(std::string_view text) const override;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace kyn::platform
