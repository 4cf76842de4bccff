#pragma once

// Fakes of the platform services, installed through the services registry.

#include "host/Process.h"
#include "platform/Services.h"
#include "platform/assistant/Model.h"
#include "platform/location/Location.h"

#include <atomic>
#include <filesystem>
#include <map>
#include <mutex>
#include <optional>
#include <string>

namespace kyn::test {

/// Account and device facts set by the test; counts how often the account was asked for.
class FakeSystemInfo final : public platform::SystemInfo {
 public:
  std::optional<platform::OwnerAccount> ownerAccount() override {
    std::lock_guard lock(mutex);
    ++accountReads;
    return account;
  }
  std::optional<std::string> deviceUDID() override { return udid; }
  std::optional<std::string> productType() override { return product; }
  std::optional<std::string> osVersion() override {
    ++osVersionReads;
    return os;
  }
  std::optional<std::string> osBuildVersion() override { return build; }

  void signIn(std::string personId = "P-1001", std::optional<std::string> token = "secret-token-42",
              std::optional<std::string> host = "kyn.example.test", std::string username = "ada@example.test") {
    std::lock_guard lock(mutex);
    account = platform::OwnerAccount(std::move(personId), std::move(username), std::move(token), std::move(host));
  }
  void signOut() {
    std::lock_guard lock(mutex);
    account.reset();
  }

  std::mutex mutex;
  std::optional<platform::OwnerAccount> account;
  int accountReads = 0;
  std::optional<std::string> udid = "0F8A2C4E-1B3D-4F5A-9C7E-2D4B6F8A0C1E";
  std::optional<std::string> product = "Test Desktop 1";
  std::optional<std::string> os = "12.4.1";
  std::optional<std::string> build = "6.1.0-test";
  std::atomic<int> osVersionReads{0};
};

class FakeSession final : public platform::ServiceSession {
 public:
  bool isProvisionedForLocationSharing() override { return provisioned; }
  bool isRestricted() override { return restricted; }
  std::atomic<bool> provisioned{true};
  std::atomic<bool> restricted{false};
};

/// A clock that stands still unless the test moves it.
class FixedClock final : public platform::Clock {
 public:
  explicit FixedClock(platform::Date now = 0.0) : now_(now) {}
  platform::Date now() const override { return now_.load(); }
  void set(platform::Date now) { now_.store(now); }

 private:
  std::atomic<platform::Date> now_;
};

using host::TempDir;

/// An assistant person with these e-mail addresses and phone numbers (an absent text makes an entry
/// without one); a list is present only when it has entries.
[[nodiscard]] std::shared_ptr<AXPerson> makePerson(std::vector<std::optional<std::string>> emails,
                                                   std::vector<std::optional<std::string>> phones,
                                                   std::optional<std::string> fullName = std::nullopt);

/// Seconds since 2001 for a UTC calendar date and time.
[[nodiscard]] platform::Date utcDate(int year, int month, int day, int hour = 0, int minute = 0, double second = 0);

/// Posts the redirect notification for a command sent to `from` (redirected to `to`, when given).
void postRedirect(const std::string& from, const std::optional<std::string>& to);

/// A platform location at this coordinate.
[[nodiscard]] platform::Location fix(double latitude, double longitude, double accuracy = 0.0,
                                     std::optional<platform::Date> timestamp = std::nullopt);

/// One vCard with these property lines ("FN:Ada\r\n...").
[[nodiscard]] std::string vcard(std::string_view properties, std::string_view version = "3.0");

/// The whole content of a file; empty when it cannot be read.
[[nodiscard]] std::string readFile(const std::filesystem::path& file);

/// Folder of the outside test data, or nothing when it is not beside the project.
[[nodiscard]] std::optional<std::filesystem::path> sharedTestData(std::string_view subfolder);

}  // namespace kyn::test
