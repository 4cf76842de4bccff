#include "platform/config/Configuration.h"

#include "platform/fs/Files.h"
#include "platform/log/Log.h"
#include "platform/value/Json.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>

namespace kyn::platform {
namespace {

std::filesystem::path resolve(const std::filesystem::path& base, const std::string& text) {
  std::filesystem::path p(text);
  return p.is_absolute() ? p : base / p;
}

}  // namespace

std::filesystem::path Configuration::defaultDirectory() {
  const char* xdg = std::getenv("XDG_CONFIG_HOME");
  if (xdg != nullptr && *xdg == '/') return std::filesystem::path(xdg) / "kyn-assistant";
  const char* home = std::getenv("HOME");
  if (home != nullptr && *home == '/') return std::filesystem::path(home) / ".config" / "kyn-assistant";
  return std::filesystem::path("kyn-assistant");
}

Configuration Configuration::load(const std::filesystem::path& directory) {
  Configuration c;
  c.directory_ = directory;
  c.contactsPath_ = directory / "contacts";

  const auto file = directory / "config.json";
  // A missing file means defaults; one too large (over 1 MiB) or unreadable is reported like bad JSON.
  auto text = readWholeFile(file, 1u << 20);
  std::error_code ec;
  if (!text && !std::filesystem::exists(file, ec)) return c;
  auto json = text ? parseJson(*text) : std::nullopt;
  if (!json || !json->is_object()) {
    Log::shared().error("Configuration file %@ is not a JSON object; using defaults", file.string());
    return c;
  }

  auto wrongType = [&](std::string_view key) {
    Log::shared().error("Configuration field %@ in %@ has the wrong type; using its default", key, file.string());
  };
  auto readString = [&](std::string_view key, auto&& apply) {
    if (const Value* v = member(*json, key)) {
      if (v->is_string()) apply(v->get<std::string>());
      else wrongType(key);
    }
  };
  auto readPositive = [&](std::string_view key, auto&& apply) {
    if (const Value* v = member(*json, key)) {
      auto n = numberValue(v);
      if (n && std::isfinite(*n) && *n > 0 && *n < 1e12) apply(*n);
      else wrongType(key);
    }
  };

  // Time limits in milliseconds; a fraction is rounded up, so that nothing below one millisecond
  // turns into no limit at all.
  auto readMilliseconds = [&](std::string_view key, std::chrono::milliseconds& limit) {
    const Value* v = member(*json, key);
    if (v == nullptr) return;
    const auto n = numberValue(v);
    if (!n || !std::isfinite(*n) || *n >= 1e12) return wrongType(key);
    if (*n < 0) {
      Log::shared().error("Configuration field %@ in %@ is negative; using its default", key, file.string());
      return;
    }
    limit = std::chrono::milliseconds(std::max(1LL, static_cast<long long>(std::ceil(*n))));
  };

  readString("caFile", [&](const std::string& s) { c.transport_.caFile = resolve(directory, s); });
  readString("contacts", [&](const std::string& s) { c.contactsPath_ = resolve(directory, s); });
  readString("language", [&](const std::string& s) { c.language_ = s; });
  readMilliseconds("connectTimeoutMs", c.transport_.connectTimeout);
  readMilliseconds("totalTimeoutMs", c.transport_.totalTimeout);
  readPositive("maxResponseBytes", [&](double n) { c.transport_.maxResponseBytes = static_cast<std::size_t>(n); });
  if (const Value* v = member(*json, "maxRedirects")) {
    auto n = numberValue(v);
    if (n && *n >= 0 && *n <= 50) c.transport_.maxRedirects = static_cast<long>(*n);
    else wrongType("maxRedirects");
  }
  return c;
}

}  // namespace kyn::platform
