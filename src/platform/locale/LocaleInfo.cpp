#include "platform/locale/LocaleInfo.h"

#include "platform/localization/Localization.h"
#include "platform/locale/IcuLocaleInfo.h"
#include "platform/localization/IcuLocalization.h"

#include <unicode/locid.h>

#include <cctype>

namespace kyn::platform {

IcuLocaleInfo::IcuLocaleInfo(std::optional<std::string> localeId) {
  const icu::Locale locale = localeId ? icu::Locale(localeId->c_str()) : icu::Locale::getDefault();
  id_ = locale.getName();
  const std::string country = locale.getCountry();
  if (!country.empty()) country_ = country;
}

std::string presentationLocaleId(const std::optional<std::string>& language, std::string_view systemLocaleId) {
  const icu::Locale system(std::string(systemLocaleId).c_str());
  if (!language || language->empty()) return system.getName();
  const icu::Locale words(icuLocaleId(*language).c_str());
  if (*words.getLanguage() == '\0') return system.getName();
  std::string id = words.getLanguage();
  if (*words.getScript() != '\0') id.append("_").append(words.getScript());
  const char* region = *system.getCountry() != '\0' ? system.getCountry() : words.getCountry();
  if (*region != '\0') id.append("_").append(region);
  return id;
}

std::string phoneRegionOfLocale(const LocaleInfo& locale) {
  auto country = locale.countryCode();
  if (!country || country->empty()) return "us";
  std::string region = *country;
  for (char& c : region) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return region;
}

}  // namespace kyn::platform
