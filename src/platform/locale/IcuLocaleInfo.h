#pragma once

#include "platform/locale/LocaleInfo.h"

#include <optional>
#include <string>

namespace kyn::platform {

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

}  // namespace kyn::platform
