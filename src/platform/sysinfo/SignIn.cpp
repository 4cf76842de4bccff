// Signing in and out: the account file and the token file of the configuration directory.
#include "platform/log/Log.h"
#include "platform/sysinfo/LinuxSystemInfo.h"
#include "platform/value/Json.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace kyn::platform {
namespace {

bool hasControlCharacter(std::string_view text) {
  for (unsigned char c : text) {
    if (c < 0x20 || c == 0x7f) return true;
  }
  return false;
}

bool isValidText(std::string_view text, std::size_t limit) {
  return !text.empty() && text.size() <= limit && !hasControlCharacter(text) && text.front() != ' ' &&
         text.back() != ' ';
}

/// host or host:port: a DNS name or IPv4 address, or an IPv6 address in brackets; a port 1 to 65535.
bool isValidServiceHost(std::string_view text) {
  if (text.empty() || text.size() > 260) return false;
  std::string_view host = text;
  std::string_view port;
  if (host.front() == '[') {
    const auto close = host.find(']');
    if (close == std::string_view::npos || close < 3) return false;
    for (char c : host.substr(1, close - 1)) {
      if (!std::isxdigit(static_cast<unsigned char>(c)) && c != ':' && c != '.') return false;
    }
    const auto rest = host.substr(close + 1);
    if (!rest.empty() && rest.front() != ':') return false;
    if (!rest.empty()) port = rest.substr(1);
    if (rest == ":") return false;
  } else {
    if (const auto colon = host.rfind(':'); colon != std::string_view::npos) {
      port = host.substr(colon + 1);
      host = host.substr(0, colon);
      if (port.empty()) return false;
    }
    if (host.empty() || host.size() > 253 || host.front() == '.' || host.front() == '-') return false;
    for (char c : host) {
      if (!std::isalnum(static_cast<unsigned char>(c)) && c != '-' && c != '.') return false;
    }
  }
  if (port.empty()) return true;
  if (port.size() > 5) return false;
  int value = 0;
  for (char c : port) {
    if (!std::isdigit(static_cast<unsigned char>(c))) return false;
    value = value * 10 + (c - '0');
  }
  return value >= 1 && value <= 65535;
}

/// Writes `text` completely to `file`.new, made exclusively (a stale one from a crash is removed
/// first) and flushed; the caller renames it over `file`.
bool stage(const std::filesystem::path& file, std::string_view text, mode_t mode) {
  const std::filesystem::path staging = file.string() + ".new";
  ::unlink(staging.c_str());
  const int fd = ::open(staging.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, mode);
  if (fd < 0) {
    Log::shared().error("Cannot write %@: %@", staging.string(), std::strerror(errno));
    return false;
  }
  bool ok = ::fchmod(fd, mode) == 0;
  while (ok && !text.empty()) {
    const ssize_t n = ::write(fd, text.data(), text.size());
    if (n < 0 && errno == EINTR) continue;
    ok = n > 0;
    if (ok) text.remove_prefix(static_cast<std::size_t>(n));
  }
  ok = ok && ::fsync(fd) == 0;
  ok = (::close(fd) == 0) && ok;
  if (!ok) {
    Log::shared().error("Cannot write %@: %@", staging.string(), std::strerror(errno));
    ::unlink(staging.c_str());
  }
  return ok;
}

bool commit(const std::filesystem::path& file) {
  const std::filesystem::path staging = file.string() + ".new";
  if (::rename(staging.c_str(), file.c_str()) == 0) return true;
  Log::shared().error("Cannot replace %@: %@", file.string(), std::strerror(errno));
  ::unlink(staging.c_str());
  return false;
}

void syncDirectory(const std::filesystem::path& directory) {
  const int fd = ::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return;
  ::fsync(fd);
  ::close(fd);
}

}  // namespace

SignInProblem checkSignIn(const SignIn& signIn) {
  if (!isValidText(signIn.personId, 256)) return SignInProblem::PersonId;
  if (!isValidText(signIn.username, 256)) return SignInProblem::Username;
  if (!isValidServiceHost(signIn.serviceHost)) return SignInProblem::ServiceHost;
  const bool blank = signIn.token.find_first_of(" \t") != std::string::npos;
  if (!isValidText(signIn.token, 4096) || blank) return SignInProblem::Token;
  return SignInProblem::None;
}

bool writeSignIn(const std::filesystem::path& directory, const SignIn& signIn) {
  if (checkSignIn(signIn) != SignInProblem::None) return false;
  std::error_code ec;
  if (!std::filesystem::is_directory(directory, ec)) {
    std::filesystem::create_directories(directory, ec);
    if (ec) {
      Log::shared().error("Cannot make the configuration directory %@: %@", directory.string(), ec.message());
      return false;
    }
    std::filesystem::permissions(directory, std::filesystem::perms::owner_all, ec);
  }
  Value account = Value::object();
  account["personId"] = signIn.personId;
  account["username"] = signIn.username;
  account["serviceHost"] = signIn.serviceHost;
  // Both files are staged completely before either replaces the old one: wrong input or a failed
  // write leaves the old account as it was.
  const auto token = directory / "token";
  const auto accountFile = directory / "account.json";
  if (!stage(token, signIn.token + "\n", 0600)) return false;
  if (!stage(accountFile, toJson(account) + "\n", 0644)) {
    ::unlink((token.string() + ".new").c_str());
    return false;
  }
  const bool written = commit(token) && commit(accountFile);
  syncDirectory(directory);
  if (written) Log::shared().notice("Signed in as %@ on %@", signIn.personId, signIn.serviceHost);
  return written;
}

bool removeSignIn(const std::filesystem::path& directory) {
  std::error_code ec;
  const bool account = std::filesystem::remove(directory / "account.json", ec);
  const bool token = std::filesystem::remove(directory / "token", ec);
  syncDirectory(directory);
  return account || token;
}

}  // namespace kyn::platform
