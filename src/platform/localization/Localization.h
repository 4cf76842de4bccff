#pragma once

#include "platform/localization/LocalizationDelegate.h"

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// The plug-in's own string tables. As a localisation delegate it serves their one (default) table.
class Localization : public KYLocalization {
 public:
  /// The text for `key` in `language` (a BCP 47 tag such as "de-CH" or an ICU id such as "de_CH"),
  /// falling back to the parent languages and then to the root (English) table; the key itself when
  /// no table has it. An empty language reads the root table.
  [[nodiscard]] virtual std::string localizedString(std::string_view key, std::string_view language) const = 0;

  [[nodiscard]] std::string localizedStringForKey(std::string_view key, std::string_view /*table*/,
                                                  std::string_view /*bundle*/,
                                                  std::string_view languageCode) const final {
    return localizedString(key, languageCode);
  }
};

/// Number texts in a locale.
class NumberFormatting {
 public:
  virtual ~NumberFormatting() = default;
  /// A whole number as plain text: the locale's digits, no grouping separator, no decimals.
  [[nodiscard]] virtual std::string integerText(std::uint64_t value) const = 0;
  /// Reads a decimal number written as the locale writes it ("1,234.5" in English, "1.234,5" in
  /// German). Nothing unless the whole text is one number.
  [[nodiscard]] virtual std::optional<double> parseDecimal(std::string_view text) const = 0;
};

}  // namespace kyn::platform
