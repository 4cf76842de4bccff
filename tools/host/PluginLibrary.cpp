#include "host/PluginLibrary.h"

#include <dlfcn.h>

#include <cstdlib>

namespace kyn::host {

PluginLibrary::PluginLibrary(const std::filesystem::path& path) {
  handle_ = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle_ == nullptr) {
    const char* why = dlerror();
    throw LoadError(why != nullptr ? why : "cannot load " + path.string());
  }
  auto resolve = [this](auto& entry, const char* name) {
    entry = reinterpret_cast<std::remove_reference_t<decltype(entry)>>(dlsym(handle_, name));
    if (entry == nullptr) {
      dlclose(handle_);
      handle_ = nullptr;
      throw LoadError(std::string("the plug-in lacks ") + name);
    }
  };
  resolve(version, "kyn_plugin_version");
  resolve(configure, "kyn_plugin_configure");
  resolve(language, "kyn_plugin_language");
  resolve(setLogLevel, "kyn_plugin_set_log_level");
  resolve(setLogCallback, "kyn_plugin_set_log_callback");
  resolve(perform, "kyn_plugin_perform");
  resolve(describeLocation, "kyn_plugin_describe_location");
  resolve(friendPicture, "kyn_plugin_friend_picture");
  resolve(findPeople, "kyn_plugin_find_people");
  resolve(findPerson, "kyn_plugin_find_person");
  resolve(signIn, "kyn_plugin_sign_in");
  resolve(account, "kyn_plugin_account");
  resolve(signOut, "kyn_plugin_sign_out");
  resolve(free, "kyn_plugin_free");
  resolve(shutdown, "kyn_plugin_shutdown");
}

PluginLibrary::~PluginLibrary() {
  if (handle_ == nullptr) return;
  shutdown();
  setLogCallback(nullptr, nullptr);
  dlclose(handle_);
}

void* PluginLibrary::symbol(const char* name) const { return dlsym(handle_, name); }

std::optional<std::string> PluginLibrary::take(char* text) const {
  if (text == nullptr) return std::nullopt;
  std::string copy(text);
  free(text);
  return copy;
}

std::filesystem::path defaultPluginPath() {
  std::error_code ec;
  const auto self = std::filesystem::read_symlink("/proc/self/exe", ec);
  if (!ec) {
    // The build tree keeps the plug-in in ../lib; an installed program finds it in the library
    // directory of its own prefix.
    for (const char* libdir : {"../lib", KYN_LIBDIR_FROM_BINDIR}) {
      auto candidate = (self.parent_path() / libdir / KYN_PLUGIN_FILE).lexically_normal();
      if (std::filesystem::exists(candidate, ec)) return candidate;
    }
  }
  return KYN_PLUGIN_FILE;
}

}  // namespace kyn::host
