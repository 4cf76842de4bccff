#include "platform/log/Log.h"
#include "platform/prefs/FilePreferencesStore.h"
#include "platform/value/Json.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

namespace kyn::platform {
namespace {

constexpr std::size_t kMaxFileBytes = 4u * 1024u * 1024u;

/// Closes a file descriptor when it goes out of scope.
class Fd {
 public:
  explicit Fd(int fd) noexcept : fd_(fd) {}
  ~Fd() {
    if (fd_ >= 0) ::close(fd_);
  }
  Fd(const Fd&) = delete;
  Fd& operator=(const Fd&) = delete;
  [[nodiscard]] int get() const noexcept { return fd_; }
  int release() noexcept { return std::exchange(fd_, -1); }

 private:
  int fd_;
};

bool writeAll(int fd, std::string_view data) noexcept {
  while (!data.empty()) {
    const ssize_t n = ::write(fd, data.data(), data.size());
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    data.remove_prefix(static_cast<std::size_t>(n));
  }
  return true;
}

std::optional<std::string> readAll(const std::filesystem::path& file) {
  Fd fd(::open(file.c_str(), O_RDONLY | O_CLOEXEC));
  if (fd.get() < 0) return std::nullopt;
  std::string text;
  char buffer[16384];
  for (;;) {
    const ssize_t n = ::read(fd.get(), buffer, sizeof buffer);
    if (n < 0) {
      if (errno == EINTR) continue;
      return std::nullopt;
    }
    if (n == 0) break;
    text.append(buffer, static_cast<std::size_t>(n));
    if (text.size() > kMaxFileBytes) return std::nullopt;
  }
  return text;
}

}  // namespace

FilePreferencesStore::FilePreferencesStore(std::filesystem::path directory) : directory_(std::move(directory)) {}

bool FilePreferencesStore::isValidDomain(std::string_view domain) noexcept {
  if (domain.empty() || domain.size() > 200 || domain.front() == '.') return false;
  for (char c : domain) {
    const bool ok = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '.' ||
                    c == '_' || c == '-';
    if (!ok) return false;
  }
  return true;
}

std::filesystem::path FilePreferencesStore::fileForDomain(std::string_view domain) const {
  return directory_ / (std::string(domain) + ".json");
}

FilePreferencesStore::FileStamp FilePreferencesStore::stampOf(const std::filesystem::path& file) noexcept {
  struct stat st {};
  if (::stat(file.c_str(), &st) != 0) return FileStamp{};
  return FileStamp{true, static_cast<std::uintmax_t>(st.st_ino), static_cast<std::uintmax_t>(st.st_size),
                   static_cast<long long>(st.st_mtim.tv_sec) * 1'000'000'000LL + st.st_mtim.tv_nsec};
}

Value FilePreferencesStore::readFile(const std::filesystem::path& file, bool logCorruption) {
  auto text = readAll(file);
  if (!text) return Value::object();  // vanished between stat and open, or unreadable
  auto parsed = parseJson(*text);
  if (parsed && parsed->is_object()) return std::move(*parsed);
  if (logCorruption) {
    Log::shared().error("Preferences file %@ is not a JSON object; it reads as empty and the next write replaces it",
                        file.string());
  }
  return Value::object();
}

void FilePreferencesStore::refresh(std::string_view domainName, Domain& domain) {
  const auto file = fileForDomain(domainName);
  const FileStamp stamp = stampOf(file);
  if (domain.stamp && *domain.stamp == stamp) return;
  domain.content = stamp.exists ? readFile(file, true) : Value::object();
  domain.stamp = stamp;
}

std::optional<Value> FilePreferencesStore::value(std::string_view domainName, std::string_view key) {
  if (!isValidDomain(domainName)) return std::nullopt;
  std::lock_guard lock(mutex_);
  Domain& domain = domains_[std::string(domainName)];
  if (auto it = domain.pending.find(key); it != domain.pending.end()) return it->second;
  refresh(domainName, domain);
  if (const Value* v = member(domain.content, key)) return *v;
  return std::nullopt;
}

void FilePreferencesStore::setValue(std::string_view domainName, std::string_view key, std::optional<Value> value) {
  if (!isValidDomain(domainName)) {
    Log::shared().error("Preferences domain %@ is not a valid name; the value is not stored", domainName);
    return;
  }
  std::lock_guard lock(mutex_);
  domains_[std::string(domainName)].pending[std::string(key)] = std::move(value);
}

bool FilePreferencesStore::synchronize(std::string_view domainName) {
  if (!isValidDomain(domainName)) return false;
  std::lock_guard lock(mutex_);
  Domain& domain = domains_[std::string(domainName)];
  if (domain.pending.empty()) return true;

  const auto file = fileForDomain(domainName);
  auto fail = [&](const char* step) {
    Log::shared().error("Preferences for %@ could not be written (%@: %@)", domainName, step, std::strerror(errno));
    return false;
  };

  std::error_code ec;
  std::filesystem::create_directories(directory_, ec);
  if (ec) return fail("create directory");

  // Serialise writers of all processes, then merge our changes into what is on disk now.
  const std::string lockPath = file.string() + ".lock";
  Fd lockFd(::open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  if (lockFd.get() < 0) return fail("open lock");
  while (::flock(lockFd.get(), LOCK_EX) != 0) {
    if (errno != EINTR) return fail("lock");
  }

  Value current = stampOf(file).exists ? readFile(file, false) : Value::object();
  for (auto& [key, value] : domain.pending) {
    if (value) current[key] = *value;
    else current.erase(key);
  }
  const std::string text = toJson(current, 2) + "\n";

  std::string tmpPath = file.string() + ".XXXXXX";
  Fd tmp(::mkstemp(tmpPath.data()));
  if (tmp.get() < 0) return fail("create temporary file");
  const bool written = writeAll(tmp.get(), text) && ::fsync(tmp.get()) == 0;
  if (!written || ::close(tmp.release()) != 0) {
    ::unlink(tmpPath.c_str());
    return fail("write");
  }
  if (::rename(tmpPath.c_str(), file.c_str()) != 0) {
    ::unlink(tmpPath.c_str());
    return fail("rename");
  }
  Fd dir(::open(directory_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (dir.get() >= 0) ::fsync(dir.get());

  domain.pending.clear();
  domain.content = std::move(current);
  domain.stamp = stampOf(file);
  return true;
}

}  // namespace kyn::platform
