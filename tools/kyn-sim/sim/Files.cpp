#include "sim/Files.h"

#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

#include <fcntl.h>
#include <unistd.h>

namespace kyn::sim {

namespace {
std::runtime_error fileError(const char* what, const std::filesystem::path& path, int error) {
  return std::runtime_error(std::string(what) + " " + path.string() + ": " + std::strerror(error));
}
}  // namespace

std::string readFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw fileError("cannot read", path, errno);
  std::ostringstream content;
  content << in.rdbuf();
  if (in.bad()) throw fileError("cannot read", path, errno);
  return std::move(content).str();
}

void writeFileAtomically(const std::filesystem::path& path, std::string_view content, unsigned mode) {
  const std::filesystem::path temporary = path.string() + ".tmp." + std::to_string(::getpid());
  const int fd = ::open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, mode);
  if (fd < 0) throw fileError("cannot write", temporary, errno);
  std::size_t written = 0;
  while (written < content.size()) {
    const ssize_t n = ::write(fd, content.data() + written, content.size() - written);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) {
      const int error = errno;
      ::close(fd);
      ::unlink(temporary.c_str());
      throw fileError("cannot write", temporary, error);
    }
    written += static_cast<std::size_t>(n);
  }
  if (::close(fd) != 0 || ::rename(temporary.c_str(), path.c_str()) != 0) {
    const int error = errno;
    ::unlink(temporary.c_str());
    throw fileError("cannot write", path, error);
  }
}

}  // namespace kyn::sim
