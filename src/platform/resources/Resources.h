#pragma once

#include "platform/value/Value.h"

#include <filesystem>
#include <optional>
#include <string_view>

namespace kyn::platform {

/// The folder of the plug-in's own resources: "resources" beside the binary that holds this code
/// (the plug-in's shared object, or the program that links it).
[[nodiscard]] std::optional<std::filesystem::path> resourceDirectory();

/// The resource `<name>.json` read as a dictionary; nothing when it is missing, unreadable or not a
/// JSON object.
[[nodiscard]] std::optional<Value> readResourceDictionary(std::string_view name);

}  // namespace kyn::platform
