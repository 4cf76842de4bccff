#include "account/Common.h"

#include "platform/Services.h"
#include "platform/net/JsonCommand.h"

namespace kyn {

using platform::services;

Common& Common::sharedInstance() {
  (void)services();  // made first, so that it outlives the account context
  static Common instance;
  static const bool loaded = (instance.loadAccountInfo(), true);
  (void)loaded;
  return instance;
}

Common::Common() {
  observer_ = services().notificationCenter().addObserver(
      std::string(platform::KYCommandRedirectedNotification),
      [this](const platform::Notification& n) { redirected(n); });
}

Common::~Common() { services().notificationCenter().removeObserver(observer_); }

void Common::loadAccountInfo() {
  std::lock_guard lock(mutex_);
  loadAccountInfoLocked();
}

void Common::loadAccountInfoLocked() {
  auto account = services().systemInfo.get()->ownerAccount();
  if (!account || !account->personId()) {
    // Nothing else changes: the facts stay unloaded, so the next read tries again.
    isAccountPresent_ = false;
    return;
  }
  isAccountPresent_ = true;
  username_ = account->username();
  personID_ = account->personId();
  appToken_ = account->tokenOfType(0);
  kynHost_ = account->hostNameOfType(0);
  isTokenAccessible_ = appToken_.has_value();
  accountInfoLoaded_ = true;
}

void Common::ensureLoadedLocked() {
  if (!accountInfoLoaded_) loadAccountInfoLocked();
}

std::optional<std::string> Common::username() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return username_;
}

std::optional<std::string> Common::personID() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return personID_;
}

std::optional<std::string> Common::appToken() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return appToken_;
}

Common::Credentials Common::credentials() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return {personID_, appToken_, kynHost_};
}

bool Common::tokenIsNotAccessible() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return !isTokenAccessible_;
}

bool Common::hasKYNUser() {
  std::lock_guard lock(mutex_);
  ensureLoadedLocked();
  return isAccountPresent_;
}

void Common::clearKYNAccount() {
  std::lock_guard lock(mutex_);
  username_.reset();
  personID_.reset();
  appToken_.reset();
  kynHost_.reset();
  accountInfoLoaded_ = false;
  isTokenAccessible_ = false;
  isAccountPresent_ = false;
}

std::optional<std::string> Common::kynHost() const {
  std::lock_guard lock(mutex_);
  return kynHost_;
}

void Common::setKynHost(std::optional<std::string> host) {
  std::lock_guard lock(mutex_);
  kynHost_ = std::move(host);
}

bool Common::accountInfoLoaded() const {
  std::lock_guard lock(mutex_);
  return accountInfoLoaded_;
}
void Common::setAccountInfoLoaded(bool loaded) {
  std::lock_guard lock(mutex_);
  accountInfoLoaded_ = loaded;
}
bool Common::isRenewingAccountCredentials() const {
  std::lock_guard lock(mutex_);
  return isRenewingAccountCredentials_;
}
void Common::setIsRenewingAccountCredentials(bool renewing) {
  std::lock_guard lock(mutex_);
  isRenewingAccountCredentials_ = renewing;
}
bool Common::isTokenAccessible() const {
  std::lock_guard lock(mutex_);
  return isTokenAccessible_;
}
void Common::setIsTokenAccessible(bool accessible) {
  std::lock_guard lock(mutex_);
  isTokenAccessible_ = accessible;
}
bool Common::isAccountPresent() const {
  std::lock_guard lock(mutex_);
  return isAccountPresent_;
}
void Common::setIsAccountPresent(bool present) {
  std::lock_guard lock(mutex_);
  isAccountPresent_ = present;
}

void Common::redirected(const platform::Notification& notification) {
  auto command = std::dynamic_pointer_cast<platform::KYJSONCommand>(notification.object);
  if (!command || !command->wasRedirected()) return;
  services().log().info("REDIRECT: %@ -> %@", command->originalHostname(), command->redirectedHostname());
  auto store = services().preferences.get();
  const auto& host = command->redirectedHostname();
  store->setValue(PreferencesBundleID, RedirectedHostKey, host ? std::optional<Value>(*host) : std::nullopt);
  store->synchronize(PreferencesBundleID);
}

std::optional<std::string> Common::redirectedHost() const {
  auto value = services().preferences.get()->value(PreferencesBundleID, RedirectedHostKey);
  return value ? platform::stringValue(&*value) : std::nullopt;
}

void Common::flushRedirection() {
  auto store = services().preferences.get();
  store->setValue(PreferencesBundleID, RedirectedHostKey, std::nullopt);
  store->synchronize(PreferencesBundleID);
}

std::optional<std::string> Common::deviceUDID() const { return services().systemInfo.get()->deviceUDID(); }

std::optional<std::string> Common::productType() const { return services().systemInfo.get()->productType(); }

std::optional<std::string> Common::buildVersion() const { return services().systemInfo.get()->osBuildVersion(); }

std::optional<std::string> Common::osVersion() {
  {
    std::lock_guard lock(mutex_);
    if (osVersion_) return osVersion_;
  }
  auto version = services().systemInfo.get()->osVersion();
  if (!version) return std::nullopt;  // nothing cached: the next call tries again
  std::lock_guard lock(mutex_);
  if (!osVersion_) osVersion_ = shortenedOSVersion(*version);
  return osVersion_;
}

bool Common::isAppRestricted() const { return services().session.get()->isRestricted(); }

bool Common::isHandleEmail(std::string_view handle) const noexcept { return handle.find('@') != std::string_view::npos; }

std::string shortenedOSVersion(std::string_view version) {
  const auto first = version.find('.');
  if (first == std::string_view::npos) return std::string(version);
  const auto second = version.find('.', first + 1);
  const std::string_view major = version.substr(0, first);
  const std::string_view minor = version.substr(first + 1, second == std::string_view::npos ? std::string_view::npos
                                                                                            : second - first - 1);
  return std::string(major) + "." + std::string(minor);
}

}  // namespace kyn
