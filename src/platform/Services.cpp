#include "platform/Services.h"

#include "platform/contacts/VCardContactStore.h"
#include "platform/prefs/FilePreferencesStore.h"
#include "platform/sysinfo/LinuxSystemInfo.h"
#include "platform/time/SystemTime.h"
#include "platform/time/IcuDateFormatting.h"
#include "platform/localization/IcuLocalization.h"
#include "platform/locale/IcuLocaleInfo.h"

#include <unicode/locid.h>
#include <unicode/uloc.h>

namespace kyn::platform {

std::optional<std::string> systemLanguageTag() {
  const icu::Locale& locale = icu::Locale::getDefault();
  const std::string name = locale.getName();
  if (std::string(locale.getLanguage()).empty() || name == "en_US_POSIX" || name == "c") return std::nullopt;
  char tag[ULOC_FULLNAME_CAPACITY] = {};
  UErrorCode status = U_ZERO_ERROR;
  uloc_toLanguageTag(locale.getName(), tag, sizeof tag, /*strict=*/false, &status);
  if (U_FAILURE(status) || tag[0] == '\0') return std::nullopt;
  return std::string(tag);
}

Services& Services::shared() {
  // Destruction runs in the reverse order of construction: what the registry's users need while
  // they are torn down is made first. Later calls only test that the reference is there.
  static Services& instance = []() -> Services& {
    (void)Log::shared();
    (void)NotificationCenter::defaultCenter();
    static Services made;
    return made;
  }();
  return instance;
}

Services::Services()
    : preferences([this] {
        return std::make_shared<FilePreferencesStore>(configuration()->preferencesDirectory());
      }),
      systemInfo([this] { return std::make_shared<LinuxSystemInfo>(*configuration()); }),
      session([this] { return std::make_shared<AccountFileSession>(configuration()->accountFile()); }),
      clock([] { return std::make_shared<SystemClock>(); }),
      calendar([] { return std::make_shared<IcuCalendar>(); }),
      localization([] { return std::make_shared<IcuLocalization>(); }),
      numberFormatting([] { return std::make_shared<IcuNumberFormatting>(); }),
      dateFormatting([this] {
        return std::make_shared<IcuDateFormatting>(
            presentationLocaleId(assistantPreferences.get()->languageCode(), locale.get()->localeId()));
      }),
      assistantPreferences([this] {
        auto language = configuration()->language();
        if (!language) language = systemLanguageTag();
        return std::make_shared<AssistantPreferences>(language);
      }),
      locale([] { return std::make_shared<IcuLocaleInfo>(); }),
      contactStore([this]() -> std::shared_ptr<ContactStore> {
        return std::make_shared<VCardContactStore>(configuration()->contactsPath(), phoneRegionOfLocale(*locale.get()));
      }),
      postalAddressFormatter([this] {
        // Region and language are read on every call: either service may be replaced meanwhile.
        return std::make_shared<TablePostalAddressFormatter>(
            [this] { return locale.get()->countryCode(); },
            [this] { return assistantPreferences.get()->languageCode(); });
      }) {}

std::shared_ptr<const Configuration> Services::configuration() {
  std::lock_guard lock(configMutex_);
  if (!configuration_) {
    configuration_ = std::make_shared<const Configuration>(Configuration::load(Configuration::defaultDirectory()));
  }
  return configuration_;
}

void Services::configure(const std::filesystem::path& directory) {
  {
    auto loaded = std::make_shared<const Configuration>(Configuration::load(directory));
    std::lock_guard lock(configMutex_);
    configuration_ = std::move(loaded);
  }
  resetSlots();
}

void Services::resetSlots() {
  preferences.set(nullptr);
  systemInfo.set(nullptr);
  session.set(nullptr);
  clock.set(nullptr);
  calendar.set(nullptr);
  localization.set(nullptr);
  numberFormatting.set(nullptr);
  dateFormatting.set(nullptr);
  assistantPreferences.set(nullptr);
  locale.set(nullptr);
  contactStore.set(nullptr);
  postalAddressFormatter.set(nullptr);
}

std::string avixUILocalizedStringForKey(std::string_view key) {
  auto& s = services();
  const auto language = s.assistantPreferences.get()->languageCode();
  return s.localization.get()->localizedString(key, language.value_or(std::string()));
}

}  // namespace kyn::platform
