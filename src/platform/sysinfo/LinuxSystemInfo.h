#pragma once

// The Linux account and device facts: the account file and token of the configuration directory,
// the machine id, DMI, os-release and uname.

#include "platform/sysinfo/SystemInfo.h"

#include <cstddef>
#include <ctime>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

class Configuration;

/// The account file as read from disk. Fields of the wrong type read as absent.
struct AccountFile {
  std::optional<std::string> personId;
  std::optional<std::string> username;
  std::optional<std::string> serviceHost;
  std::optional<bool> provisioned;
  std::optional<bool> restricted;
};

/// Reads the account file: nothing when it is missing; nothing (logged) when it is empty, malformed
/// or not a JSON object; a field of the wrong type is logged and read as absent.
[[nodiscard]] std::optional<AccountFile> readAccountFile(const std::filesystem::path& file);

/// While one lives, this thread reads the account file once (the first file read; another is read
/// each time): the checks of one command see one version of the account, and look at the disk
/// once. A scope made inside another adds nothing. It lives on the stack of the thread it serves.
class AccountFileReadOnce {
 public:
  AccountFileReadOnce() noexcept;
  ~AccountFileReadOnce();
  AccountFileReadOnce(const AccountFileReadOnce&) = delete;
  AccountFileReadOnce& operator=(const AccountFileReadOnce&) = delete;
  static void* operator new(std::size_t) = delete;
  static void* operator new[](std::size_t) = delete;

 private:
  friend std::optional<AccountFile> readAccountFile(const std::filesystem::path& file);
  bool outermost_;
  bool read_ = false;
  std::filesystem::path file_;
  std::optional<AccountFile> account_;
};

/// Reads the application token: the environment variable KYN_APP_TOKEN when it is set and not empty,
/// otherwise the token file. The file must be a regular file owned by this user that no one else may
/// read or write; any other file is refused with a log line. Surrounding blanks are trimmed; an empty
/// token is none. The token itself is never logged. Every command reads it: a file whose stamp,
/// taken at `now`, is unchanged since it was last read is not opened again.
[[nodiscard]] std::optional<std::string> readApplicationToken(const std::filesystem::path& tokenFile,
                                                              std::time_t now = std::time(nullptr));

/// What signing in stores: the account and its application token.
struct SignIn {
  std::string personId;
  std::string username;
  std::string serviceHost;  ///< host or host:port, no scheme
  std::string token;        ///< a secret: never logged, never in a message
};

/// What is wrong with a sign-in, field by field; the first problem decides.
enum class SignInProblem { None, PersonId, Username, ServiceHost, Token };
[[nodiscard]] SignInProblem checkSignIn(const SignIn& signIn);

/// Stores a checked sign-in in `directory` (made, owner-only, when missing): account.json and the
/// owner-only token file, each written completely under a fixed temporary name, flushed and renamed
/// over the old file, so that a failure or a crash leaves the old file or the new one. Returns
/// whether both were written; the reason of a failure is logged.
[[nodiscard]] bool writeSignIn(const std::filesystem::path& directory, const SignIn& signIn);

/// Removes account.json and the token file of `directory`; false when neither was there.
bool removeSignIn(const std::filesystem::path& directory);

/// Linux: the account from the configuration directory; device facts from the machine id (an
/// application-specific derivation; the raw id never leaves the machine), DMI, os-release and uname.
class LinuxSystemInfo final : public SystemInfo {
 public:
  struct Paths {
    std::filesystem::path accountFile;
    std::filesystem::path tokenFile;
    std::filesystem::path productName = "/sys/class/dmi/id/product_name";
    std::filesystem::path osRelease = "/etc/os-release";
  };

  explicit LinuxSystemInfo(const Configuration& configuration);
  explicit LinuxSystemInfo(Paths paths) : paths_(std::move(paths)) {}

  std::optional<OwnerAccount> ownerAccount() override;
  std::optional<std::string> deviceUDID() override;
  std::optional<std::string> productType() override;
  std::optional<std::string> osVersion() override;
  std::optional<std::string> osBuildVersion() override;

 private:
  Paths paths_;
};

/// The session facts kept in the account file: "provisioned" (default yes) and "restricted"
/// (default no). Without an account nothing is provisioned.
class AccountFileSession final : public ServiceSession {
 public:
  explicit AccountFileSession(std::filesystem::path accountFile) : accountFile_(std::move(accountFile)) {}
  bool isProvisionedForLocationSharing() override;
  bool isRestricted() override;

 private:
  std::filesystem::path accountFile_;
};

/// Reads KEY=value from an os-release text (quotes removed); nothing when the key is absent or empty.
[[nodiscard]] std::optional<std::string> osReleaseField(std::string_view text, std::string_view key);

}  // namespace kyn::platform
