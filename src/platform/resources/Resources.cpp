#include "platform/resources/Resources.h"

#include "platform/fs/Files.h"
#include "platform/value/Json.h"

#include <dlfcn.h>

namespace kyn::platform {

std::optional<std::filesystem::path> resourceDirectory() {
  Dl_info info{};
  if (dladdr(reinterpret_cast<const void*>(&resourceDirectory), &info) == 0 || info.dli_fname == nullptr) {
    return std::nullopt;
  }
  std::error_code ec;
  const auto binary = std::filesystem::weakly_canonical(info.dli_fname, ec);
  if (ec) return std::nullopt;
  return binary.parent_path() / "resources";
}

std::optional<Value> readResourceDictionary(std::string_view name) {
  const auto directory = resourceDirectory();
  if (!directory) return std::nullopt;
  const auto text = readWholeFile(*directory / (std::string(name) + ".json"), 4u << 20);
  if (!text) return std::nullopt;
  auto value = parseJson(*text);
  if (!value || !value->is_object()) return std::nullopt;
  return value;
}

}  // namespace kyn::platform
