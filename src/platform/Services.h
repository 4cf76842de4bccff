#pragma once

// The platform services that the plug-in reaches, in one registry. Each service is built on first use
// from the configuration (the Linux implementation); a host or a test may install its own.

#include "platform/address/PostalAddress.h"
#include "platform/assistant/AssistantPreferences.h"
#include "platform/config/Configuration.h"
#include "platform/contacts/ContactStore.h"
#include "platform/locale/LocaleInfo.h"
#include "platform/localization/Localization.h"
#include "platform/log/Log.h"
#include "platform/notify/NotificationCenter.h"
#include "platform/prefs/PreferencesStore.h"
#include "platform/sysinfo/SystemInfo.h"
#include "platform/time/Clock.h"
#include "platform/time/DateFormatting.h"

#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>

namespace kyn::platform {

/// One service: built lazily by its factory, replaceable. Thread-safe.
template <class T>
class ServiceSlot {
 public:
  using Factory = std::function<std::shared_ptr<T>()>;

  explicit ServiceSlot(Factory factory) : factory_(std::move(factory)) {}

  [[nodiscard]] std::shared_ptr<T> get() {
    std::lock_guard lock(mutex_);
    if (!value_) value_ = factory_();
    return value_;
  }
  /// Installs `value`; nothing returns the slot to its factory's service.
  void set(std::shared_ptr<T> value) {
    std::lock_guard lock(mutex_);
    value_ = std::move(value);
  }

 private:
  std::mutex mutex_;
  Factory factory_;
  std::shared_ptr<T> value_;
};

class Services {
 public:
  /// The process-wide registry. It lives until the plug-in is unloaded; the log and the notification
  /// centre are made before it and outlive it, and every process-wide object made later (the account
  /// context, the data source) is destroyed before it.
  static Services& shared();

  /// Reads the configuration of `directory` and drops every service built from the previous one,
  /// so that the next use builds it afresh. Services installed by hand are dropped as well.
  void configure(const std::filesystem::path& directory);
  [[nodiscard]] std::shared_ptr<const Configuration> configuration();

  ServiceSlot<PreferencesStore> preferences;
  ServiceSlot<SystemInfo> systemInfo;
  ServiceSlot<ServiceSession> session;
  ServiceSlot<Clock> clock;
  ServiceSlot<Calendar> calendar;
  ServiceSlot<Localization> localization;
  ServiceSlot<NumberFormatting> numberFormatting;
  /// In the assistant's language with the conventions of the system locale's region.
  ServiceSlot<DateFormatting> dateFormatting;
  ServiceSlot<AssistantPreferences> assistantPreferences;
  ServiceSlot<LocaleInfo> locale;
  ServiceSlot<ContactStore> contactStore;
  ServiceSlot<PostalAddressFormatter> postalAddressFormatter;

  [[nodiscard]] Log& log() { return Log::shared(); }
  [[nodiscard]] NotificationCenter& notificationCenter() { return NotificationCenter::defaultCenter(); }

 private:
  Services();
  void resetSlots();

  std::mutex configMutex_;
  std::shared_ptr<const Configuration> configuration_;
};

[[nodiscard]] inline Services& services() { return Services::shared(); }

/// The assistant's lookup of the plug-in's strings (`avixUILocalizedStringForKey:table:`): the
/// default table, in the assistant's language.
[[nodiscard]] std::string avixUILocalizedStringForKey(std::string_view key);

}  // namespace kyn::platform
