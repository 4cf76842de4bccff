#pragma once

// Reading small files whole.

#include <array>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <optional>
#include <string>

namespace kyn::platform {

/// The whole content of `file`; nothing when it cannot be opened or read, or holds more than `limit`
/// bytes. Plain system calls: the account and the preferences are read on every command.
[[nodiscard]] std::optional<std::string> readWholeFile(const std::filesystem::path& file, std::size_t limit);

/// What tells that a file changed without reading it: whether it exists, its device, inode, size and
/// change times. A change in place within the clock's granularity may keep all of them, so what was
/// read under a stamp counts as current only when that stamp was taken over a second after the
/// file's last change ("settled"); any later change then shows.
struct FileStamp {
  bool exists = false;
  std::array<std::int64_t, 7> fields{};
  bool settled = true;  // a missing file has nothing to race with

  /// The file's stamp, taken at `now`.
  [[nodiscard]] static FileStamp of(const std::filesystem::path& file, std::time_t now = std::time(nullptr)) noexcept;
  /// The stamp of `file` itself when it is a symbolic link, not of what it points to.
  [[nodiscard]] static FileStamp ofLink(const std::filesystem::path& file, std::time_t now = std::time(nullptr)) noexcept;
  /// When the content last changed, in seconds since 1970.
  [[nodiscard]] std::int64_t modified() const noexcept { return fields[3]; }
  /// Whether what was read under `earlier` is still the file's content.
  [[nodiscard]] bool unchangedSince(const FileStamp& earlier) const noexcept {
    return earlier.settled && exists == earlier.exists && fields == earlier.fields;
  }
};

}  // namespace kyn::platform
