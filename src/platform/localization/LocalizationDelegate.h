#pragma once

#include <string>
#include <string_view>

namespace kyn::platform {

/// Where a support-library object (the distance calculator) gets the texts it does not make itself.
class KYLocalization {
 public:
  virtual ~KYLocalization() = default;
  /// The text for `key` from `table` of `bundle` (empty: the default table of the host's own
  /// strings) in `languageCode`; the key itself when there is none.
  [[nodiscard]] virtual std::string localizedStringForKey(std::string_view key, std::string_view table,
                                                          std::string_view bundle,
                                                          std::string_view languageCode) const = 0;
};

}  // namespace kyn::platform
