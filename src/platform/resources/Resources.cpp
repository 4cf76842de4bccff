#include "platform/resources/Resources.h"

#include "platform/value/Json.h"

#include <dlfcn.h>

#include <fstream>
#include <sstream>

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
  std::ifstream in(*directory / (std::string(name) + ".json"), std::ios::binary);
  if (!in) return std::nullopt;
  std::stringstream text;
  text << in.rdbuf();
  auto value = parseJson(text.str());
  if (!value || !value->is_object()) return std::nullopt;
  return value;
}

}  // namespace kyn::platform
