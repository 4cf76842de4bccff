#pragma once

// The plug-in as a host loads it: dlopen, every entry point resolved, and unloaded cleanly.

#include "plugin/kyn_plugin.h"

#include <filesystem>
#include <optional>
#include <stdexcept>
#include <string>

namespace kyn::host {

/// The plug-in could not be loaded, or lacks an entry point; the message says which.
class LoadError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// libkyn-assistant.so loaded with dlopen. Destroying it shuts the plug-in down (every command in
/// flight is answered first), detaches the log callback and unloads the library.
class PluginLibrary {
 public:
  /// Loads the plug-in at `path` and resolves every entry point; throws LoadError.
  explicit PluginLibrary(const std::filesystem::path& path);
  ~PluginLibrary();
  PluginLibrary(const PluginLibrary&) = delete;
  PluginLibrary& operator=(const PluginLibrary&) = delete;

  decltype(&kyn_plugin_version) version = nullptr;
  decltype(&kyn_plugin_configure) configure = nullptr;
  decltype(&kyn_plugin_language) language = nullptr;
  decltype(&kyn_plugin_set_log_level) setLogLevel = nullptr;
  decltype(&kyn_plugin_set_log_callback) setLogCallback = nullptr;
  decltype(&kyn_plugin_perform) perform = nullptr;
  decltype(&kyn_plugin_describe_location) describeLocation = nullptr;
  decltype(&kyn_plugin_friend_picture) friendPicture = nullptr;
  decltype(&kyn_plugin_find_people) findPeople = nullptr;
  decltype(&kyn_plugin_find_person) findPerson = nullptr;
  decltype(&kyn_plugin_sign_in) signIn = nullptr;
  decltype(&kyn_plugin_account) account = nullptr;
  decltype(&kyn_plugin_sign_out) signOut = nullptr;
  decltype(&kyn_plugin_free) free = nullptr;
  decltype(&kyn_plugin_shutdown) shutdown = nullptr;

  /// Another exported symbol of the plug-in, or nullptr.
  [[nodiscard]] void* symbol(const char* name) const;
  /// A text the plug-in returned, freed here; nothing for NULL.
  [[nodiscard]] std::optional<std::string> take(char* text) const;

 private:
  void* handle_ = nullptr;
};

/// The plug-in in the library directory beside the running program's (../lib in the build tree, the
/// installed library directory after an install), else its bare SONAME, which the dynamic loader
/// looks up in its own search path.
[[nodiscard]] std::filesystem::path defaultPluginPath();

}  // namespace kyn::host
