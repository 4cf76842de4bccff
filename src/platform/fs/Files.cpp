#include "platform/fs/Files.h"

#include <fcntl.h>
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

}  // namespace kyn::platform
