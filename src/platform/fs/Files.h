#pragma once

// Reading small files whole.

#include <cstddef>
#include <filesystem>
#include <optional>
#include <string>

namespace kyn::platform {

/// The whole content of `file`; nothing when it cannot be opened or read, or holds more than `limit`
/// bytes. Plain system calls: the account and the preferences are read on every command.
[[nodiscard]] std::optional<std::string> readWholeFile(const std::filesystem::path& file, std::size_t limit);

}  // namespace kyn::platform
