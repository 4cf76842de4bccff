#pragma once

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <optional>
#include <string>

namespace kyn::platform {

/// Limits and trust of the HTTPS transport.
struct TransportSettings {
  /// An extra CA file trusted besides the system's (how a test server's certificate is trusted).
  std::optional<std::filesystem::path> caFile;
  std::chrono::milliseconds connectTimeout{10'000};
  std::chrono::milliseconds totalTimeout{30'000};
  std::size_t maxResponseBytes = 8u * 1024u * 1024u;
  long maxRedirects = 5;
};

/// Where the plug-in finds its files, and the settings of config.json. Every file lives in one
/// configuration directory:
///
///   config.json      settings (all optional, see README)
///   account.json     the signed-in account
///   token            the application token, readable by its owner only
///   preferences/     one JSON file per application domain
///   contacts/        the address book (vCard files), unless config.json names another place
class Configuration {
 public:
  /// $XDG_CONFIG_HOME/kyn-assistant, else $HOME/.config/kyn-assistant, else ./kyn-assistant.
  [[nodiscard]] static std::filesystem::path defaultDirectory();

  /// Reads `directory`/config.json. A missing file gives the defaults; a malformed file or a field of
  /// the wrong type is logged and its defaults are used.
  [[nodiscard]] static Configuration load(const std::filesystem::path& directory);

  [[nodiscard]] const std::filesystem::path& directory() const noexcept { return directory_; }
  [[nodiscard]] std::filesystem::path accountFile() const { return directory_ / "account.json"; }
  [[nodiscard]] std::filesystem::path tokenFile() const { return directory_ / "token"; }
  [[nodiscard]] std::filesystem::path preferencesDirectory() const { return directory_ / "preferences"; }
  [[nodiscard]] const std::filesystem::path& contactsPath() const noexcept { return contactsPath_; }
  [[nodiscard]] const std::optional<std::string>& language() const noexcept { return language_; }
  [[nodiscard]] const TransportSettings& transport() const noexcept { return transport_; }

 private:
  std::filesystem::path directory_;
  std::filesystem::path contactsPath_;
  std::optional<std::string> language_;
  TransportSettings transport_;
};

}  // namespace kyn::platform
