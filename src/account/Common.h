#pragma once

#include "platform/assistant/Model.h"
#include "platform/notify/NotificationCenter.h"

#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn {

/// The preferences domain of the plug-in.
inline constexpr std::string_view PreferencesBundleID = "com.zanto.tessel.kyn.assistant";
/// The key under which the host of the last server redirect is kept.
inline constexpr std::string_view RedirectedHostKey = "RedirectedHostKey";

/// The account and device context: the signed-in account's identifiers, token and host, the host
/// the server last redirected the plug-in to (kept across restarts), and the device facts of the
/// client context. Account facts are in one of three states: not loaded (after creation or
/// `clearKYNAccount`), loaded without an account (retried on each read) and loaded.
///
/// Thread-safe: the host's thread reads the account while the network thread delivers redirects.
class Common {
 public:
  /// The process-wide instance, created (and its account loaded) on first use.
  static Common& sharedInstance();

  /// Registers for the redirect notification on the default centre.
  Common();
  /// Unregisters from the default centre.
  ~Common();
  Common(const Common&) = delete;
  Common& operator=(const Common&) = delete;

  /// Reads the account facts from the system-information service.
  void loadAccountInfo();
  /// Handler of the redirect notification: stores the redirected host of a redirected command.
  void redirected(const platform::Notification& notification);

  // Account facts; each loads them first when they are not loaded.
  [[nodiscard]] std::optional<std::string> username();
  [[nodiscard]] std::optional<std::string> personID();
  /// The application token. A secret: never logged.
  [[nodiscard]] std::optional<std::string> appToken();
  [[nodiscard]] bool tokenIsNotAccessible();
  /// What every request is made with, read together: the person identifier, the token (a secret:
  /// never logged) and the account's service host.
  struct Credentials {
    std::optional<std::string> personID;
    std::optional<std::string> appToken;
    std::optional<std::string> kynHost;
  };
  [[nodiscard]] Credentials credentials();
  [[nodiscard]] bool hasKYNUser();
  /// Forgets every account fact; the next read loads them afresh.
  void clearKYNAccount();

  /// The account's service host as stored, without loading.
  [[nodiscard]] std::optional<std::string> kynHost() const;
  void setKynHost(std::optional<std::string> host);

  [[nodiscard]] bool accountInfoLoaded() const;
  void setAccountInfoLoaded(bool loaded);
  [[nodiscard]] bool isRenewingAccountCredentials() const;
  void setIsRenewingAccountCredentials(bool renewing);
  [[nodiscard]] bool isTokenAccessible() const;
  void setIsTokenAccessible(bool accessible);
  [[nodiscard]] bool isAccountPresent() const;
  void setIsAccountPresent(bool present);

  /// The host of the last redirect, read from the preferences store on each call.
  [[nodiscard]] std::optional<std::string> redirectedHost() const;
  /// Forgets the redirected host.
  void flushRedirection();

  [[nodiscard]] std::optional<std::string> deviceUDID() const;
  [[nodiscard]] std::optional<std::string> productType() const;
  [[nodiscard]] std::optional<std::string> buildVersion() const;
  /// The OS version cut to two components, cached once known.
  [[nodiscard]] std::optional<std::string> osVersion();
  /// Use of the service is restricted for this user.
  [[nodiscard]] bool isAppRestricted() const;
  /// Always true.
  [[nodiscard]] bool isKYNAllowed() const noexcept { return true; }
  // ---- Handles ----

  /// True when the handle holds "@" anywhere: every other handle is a phone handle.
  [[nodiscard]] bool isHandleEmail(std::string_view handle) const noexcept;
  /// The server handles of a person: its completed phone numbers (or, when it brought none, its
  /// contact's), then its e-mail addresses as they stand. Duplicates are kept.
  [[nodiscard]] std::vector<std::string> handlesForAXPerson(const AXPerson& person) const;
  /// The same handles, appended to `handles`.
  void appendHandlesForAXPerson(const AXPerson& person, std::vector<std::string>& handles) const;
  /// A raw phone number in canonical form: leading junk cut, then read in the default country;
  /// the cut text when it is no phone number; nothing for nothing.
  [[nodiscard]] std::optional<std::string> completeNumberForPhoneNumber(const std::optional<std::string>& raw) const;
  /// The lower-case country code of the current locale, "us" when it has none; read on each call.
  [[nodiscard]] static std::string defaultCountryCode();


 private:
  void loadAccountInfoLocked();
  void ensureLoadedLocked();

  mutable std::mutex mutex_;
  std::optional<std::string> username_;
  std::optional<std::string> personID_;
  std::optional<std::string> appToken_;
  std::optional<std::string> kynHost_;
  bool accountInfoLoaded_ = false;
  bool isRenewingAccountCredentials_ = false;
  bool isTokenAccessible_ = false;
  bool isAccountPresent_ = false;
  std::optional<std::string> osVersion_;

  platform::NotificationCenter::Token observer_ = 0;
};

/// A dotted version cut to its first two components ("10.15.7" gives "10.15"; "11" stays "11").
[[nodiscard]] std::string shortenedOSVersion(std::string_view version);

}  // namespace kyn
