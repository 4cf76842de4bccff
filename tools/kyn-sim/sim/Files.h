#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace kyn::sim {

/// The bytes of a file; throws std::runtime_error naming the path when it cannot be read.
[[nodiscard]] std::string readFile(const std::filesystem::path& path);

/// Writes a file through a temporary file beside it and a rename, so that a reader polling for it
/// sees nothing or everything; `mode` is the new file's permission bits. Throws std::runtime_error
/// naming the path on failure.
void writeFileAtomically(const std::filesystem::path& path, std::string_view content, unsigned mode = 0644);

}  // namespace kyn::sim
