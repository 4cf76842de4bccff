#include "platform/fs/Files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace kyn::platform {

std::optional<std::string> readWholeFile(const std::filesystem::path& file, std::size_t limit) {
  const int fd = ::open(file.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return std::nullopt;
  std::optional<std::string> text(std::in_place);
  char buffer[16384];
  for (;;) {
    const ssize_t n = ::read(fd, buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) {
      if (n < 0) text.reset();
      break;
    }
    text->append(buffer, static_cast<std::size_t>(n));
    if (text->size() > limit) {
      text.reset();
      break;
    }
  }
  ::close(fd);
  return text;
}

namespace {

FileStamp stampOf(int result, const struct stat& st, std::time_t now) noexcept {
  FileStamp stamp;
  if (result != 0) return stamp;
  stamp.exists = true;
  stamp.fields = {static_cast<std::int64_t>(st.st_dev), static_cast<std::int64_t>(st.st_ino), st.st_size,
                  st.st_mtim.tv_sec, st.st_mtim.tv_nsec, st.st_ctim.tv_sec, st.st_ctim.tv_nsec};
  stamp.settled = now - st.st_mtim.tv_sec > 1 && now - st.st_ctim.tv_sec > 1;
  return stamp;
}

}  // namespace

FileStamp FileStamp::of(const std::filesystem::path& file, std::time_t now) noexcept {
  struct stat st {};
  const int result = ::stat(file.c_str(), &st);
  return stampOf(result, st, now);
}

FileStamp FileStamp::ofLink(const std::filesystem::path& file, std::time_t now) noexcept {
  struct stat st {};
  const int result = ::lstat(file.c_str(), &st);
  return stampOf(result, st, now);
}

}  // namespace kyn::platform
