#include "platform/fs/Files.h"
#include "platform/log/Log.h"
#include "platform/text/ByteClass.h"
#include "platform/prefs/FilePreferencesStore.h"
#include "platform/value/Json.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
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

// Opens and locks the domain's lock file `name` in `dir`. A writer renames the lock file it holds
// over the domain's file, so a lock won on a file that no longer bears the name is worthless: then
// the file now named so (created anew when there is none) is taken instead. -1 with errno on failure.
int lockStagingFile(int dir, const std::string& name) {
  for (;;) {
    Fd fd(::openat(dir, name.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (fd.get() < 0) return -1;
    while (::flock(fd.get(), LOCK_EX) != 0) {
      if (errno != EINTR) return -1;
    }
    struct stat held {};
    struct stat named {};
    if (::fstat(fd.get(), &held) != 0) return -1;
    if (::fstatat(dir, name.c_str(), &named, AT_SYMLINK_NOFOLLOW) != 0) {
      if (errno == ENOENT) continue;
      return -1;
    }
    if (named.st_dev == held.st_dev && named.st_ino == held.st_ino) return fd.release();
  }
}

// Earlier versions wrote through temporary files named "<file>.XXXXXX" (six letters or digits), which
// a crash left behind for good. Called under the lock, so no write of ours is using one.
void removeStaleTemporaries(int dir, const std::string& fileName) {
  const int listFd = ::dup(dir);
  if (listFd < 0) return;
  DIR* listing = ::fdopendir(listFd);
  if (listing == nullptr) {
    ::close(listFd);
    return;
  }
  const std::string prefix = fileName + ".";
  while (const dirent* entry = ::readdir(listing)) {
    const std::string_view name(entry->d_name);
    if (name.size() != prefix.size() + 6 || !name.starts_with(prefix)) continue;
    const std::string_view suffix = name.substr(prefix.size());
    // mkstemp's six random letters and digits; a plain lower-case word ("backup") is a user's file.
    const auto lower = [](char c) { return c >= 'a' && c <= 'z'; };
    const auto upperOrDigit = [](char c) { return (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9'); };
    const bool random = std::all_of(suffix.begin(), suffix.end(), [&](char c) { return lower(c) || upperOrDigit(c); }) &&
                        std::any_of(suffix.begin(), suffix.end(), upperOrDigit);
    // mkstemp also made them regular files for the owner alone.
    struct stat st {};
    if (random && ::fstatat(dir, entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(st.st_mode) &&
        (st.st_mode & 077) == 0) {
      ::unlinkat(dir, entry->d_name, 0);
    }
  }
  ::closedir(listing);
}

}  // namespace

FilePreferencesStore::FilePreferencesStore(std::filesystem::path directory) : directory_(std::move(directory)) {}

bool FilePreferencesStore::isValidDomain(std::string_view domain) noexcept {
  // Every read checks the name.
  static constexpr auto kAllowed = byteClass([](unsigned char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '.' || c == '_' || c == '-';
  });
  if (domain.empty() || domain.size() > 200 || domain.front() == '.') return false;
  return std::all_of(domain.begin(), domain.end(), [](char c) { return kAllowed[static_cast<unsigned char>(c)]; });
}

std::filesystem::path FilePreferencesStore::fileForDomain(std::string_view domain) const {
  return directory_ / (std::string(domain) + ".json");
}

Value FilePreferencesStore::readFile(const std::filesystem::path& file, bool logCorruption) {
  auto text = readWholeFile(file, kMaxFileBytes);
  if (!text) return Value::object();  // vanished between stat and open, or unreadable
  auto parsed = parseJson(*text);
  if (parsed && parsed->is_object()) return std::move(*parsed);
  if (logCorruption) {
    Log::shared().error("Preferences file %@ is not a JSON object; it reads as empty and the next write replaces it",
                        file.string());
  }
  return Value::object();
}

FilePreferencesStore::Domain& FilePreferencesStore::domainNamed(std::string_view domainName) {
  if (const auto it = domains_.find(domainName); it != domains_.end()) return it->second;
  Domain& domain = domains_[std::string(domainName)];
  domain.file = fileForDomain(domainName);
  return domain;
}

void FilePreferencesStore::refresh(Domain& domain) {
  const FileStamp stamp = FileStamp::of(domain.file);
  if (domain.stamp && stamp.unchangedSince(*domain.stamp)) return;
  domain.content = stamp.exists ? readFile(domain.file, true) : Value::object();
  domain.stamp = stamp;
}

std::optional<Value> FilePreferencesStore::value(std::string_view domainName, std::string_view key) {
  if (!isValidDomain(domainName)) return std::nullopt;
  std::lock_guard lock(mutex_);
  Domain& domain = domainNamed(domainName);
  if (auto it = domain.pending.find(key); it != domain.pending.end()) return it->second;
  refresh(domain);
  if (const Value* v = member(domain.content, key)) return *v;
  return std::nullopt;
}

void FilePreferencesStore::setValue(std::string_view domainName, std::string_view key, std::optional<Value> value) {
  if (!isValidDomain(domainName)) {
    Log::shared().error("Preferences domain %@ is not a valid name; the value is not stored", domainName);
    return;
  }
  std::lock_guard lock(mutex_);
  domainNamed(domainName).pending[std::string(key)] = std::move(value);
}

bool FilePreferencesStore::synchronize(std::string_view domainName) {
  if (!isValidDomain(domainName)) return false;
  std::lock_guard lock(mutex_);
  Domain& domain = domainNamed(domainName);
  if (domain.pending.empty()) return true;

  const std::filesystem::path& file = domain.file;
  auto fail = [&](const char* step) {
    Log::shared().error("Preferences for %@ could not be written (%@: %@)", domainName, step, std::strerror(errno));
    return false;
  };

  std::error_code ec;
  std::filesystem::create_directories(directory_, ec);
  if (ec) return fail("create directory");
  Fd dir(::open(directory_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (dir.get() < 0) return fail("open directory");

  // Serialise the writers of all processes on the lock file, then merge our changes into what is
  // on disk now.
  const std::string fileName = file.filename().string();
  const std::string lockName = fileName + ".lock";
  Fd staging(lockStagingFile(dir.get(), lockName));
  if (staging.get() < 0) return fail("lock");
  // Earlier versions' temporaries can only be older than this process's first write.
  if (!domain.swept) {
    removeStaleTemporaries(dir.get(), fileName);
    domain.swept = true;
  }

  Value current = readFile(file, false);  // a missing file reads as empty
  for (auto& [key, value] : domain.pending) {
    if (value) current[key] = *value;
    else current.erase(key);
  }
  const std::string text = toJson(current, 2) + "\n";

  // The new content goes into the lock file itself, which then replaces the domain's file. So the
  // folder never holds more than these two files, whatever happens to the process, and a crash
  // before the rename leaves the old content (and a lock file with a partial copy, which the next
  // writer overwrites).
  if (::ftruncate(staging.get(), 0) != 0 || ::fchmod(staging.get(), 0600) != 0 || !writeAll(staging.get(), text) ||
      ::fsync(staging.get()) != 0) {
    return fail("write");
  }
  if (::renameat(dir.get(), lockName.c_str(), dir.get(), fileName.c_str()) != 0) return fail("rename");
  ::fsync(dir.get());

  domain.pending.clear();
  domain.content = std::move(current);
  domain.stamp = FileStamp::of(file);
  return true;
}

}  // namespace kyn::platform
