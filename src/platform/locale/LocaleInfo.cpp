#include "platform/locale/LocaleInfo.h"

#include <unicode/locid.h>

#include <cctype>

namespace kyn::platform {

IcuLocaleInfo::IcuLocaleInfo(std::optional<std::string> localeId) {
  const icu::Locale locale = localeId ? icu::Locale(localeId->c_str()) : icu::Locale::getDefault();
  id_ = locale.getName();
  const std::string country = locale.getCountry();
  if (!country.empty()) country_ = country;
}

std::string phoneRegionOfLocale(const LocaleInfo& locale) {
  auto country = locale.countryCode();
  if (!country || country->empty()) return "us";
  std::string region = *country;
  for (char& c : region) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return region;
}

}  // namespace kyn::platform
