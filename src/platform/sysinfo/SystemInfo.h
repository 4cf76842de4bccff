#pragma once

#include <optional>
#include <string>

namespace kyn::platform {

/// The account that owns the service sign-in on this machine.
class OwnerAccount {
 public:
  OwnerAccount(std::optional<std::string> personId, std::optional<std::string> username,
               std::optional<std::string> token, std::optional<std::string> host)
      : personId_(std::move(personId)), username_(std::move(username)), token_(std::move(token)),
        host_(std::move(host)) {}

  [[nodiscard]] const std::optional<std::string>& personId() const noexcept { return personId_; }
  [[nodiscard]] const std::optional<std::string>& username() const noexcept { return username_; }
  /// Type 0 is the application token of this service; other types have none.
  [[nodiscard]] std::optional<std::string> tokenOfType(int type) const { return type == 0 ? token_ : std::nullopt; }
  /// Type 0 is the host (host[:port]) of this service's server; other types have none.
  [[nodiscard]] std::optional<std::string> hostNameOfType(int type) const { return type == 0 ? host_ : std::nullopt; }

 private:
  std::optional<std::string> personId_;
  std::optional<std::string> username_;
  std::optional<std::string> token_;
  std::optional<std::string> host_;
};

/// Account and device facts.
class SystemInfo {
 public:
  virtual ~SystemInfo() = default;
  /// The signed-in account, or nothing. Read afresh on each call.
  [[nodiscard]] virtual std::optional<OwnerAccount> ownerAccount() = 0;
  [[nodiscard]] virtual std::optional<std::string> deviceUDID() = 0;
  [[nodiscard]] virtual std::optional<std::string> productType() = 0;
  [[nodiscard]] virtual std::optional<std::string> osVersion() = 0;
  [[nodiscard]] virtual std::optional<std::string> osBuildVersion() = 0;
};

/// The service session: whether the account may use location sharing here.
class ServiceSession {
 public:
  virtual ~ServiceSession() = default;
  [[nodiscard]] virtual bool isProvisionedForLocationSharing() = 0;
  /// Use of the service is restricted for this user or device.
  [[nodiscard]] virtual bool isRestricted() = 0;
};

}  // namespace kyn::platform
