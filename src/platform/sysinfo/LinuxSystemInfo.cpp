#include "platform/config/Configuration.h"
#include "platform/fs/Files.h"
#include "platform/log/Log.h"
#include "platform/sysinfo/LinuxSystemInfo.h"
#include "platform/value/Json.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <systemd/sd-id128.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <mutex>

namespace kyn::platform {
namespace {

constexpr std::size_t kMaxAccountBytes = 64 * 1024;
constexpr std::size_t kMaxTokenBytes = 4096;

// Application id from which the device identifier is derived, so that this application's id cannot
// be correlated with another application's.
constexpr sd_id128_t kApplicationId = {{0x6b, 0x79, 0x6e, 0x2d, 0x61, 0x73, 0x73, 0x69, 0x73, 0x74, 0x61, 0x6e, 0x74, 0x2d, 0x69, 0x64}};

std::string trim(std::string_view s) {
  const auto blank = [](char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; };
  while (!s.empty() && blank(s.front())) s.remove_prefix(1);
  while (!s.empty() && blank(s.back())) s.remove_suffix(1);
  return std::string(s);
}

std::optional<AccountFile> parseAccountFile(const std::filesystem::path& file, const std::string& text) {
  auto json = parseJson(text);
  if (!json || !json->is_object()) {
    Log::shared().error("Account file %@ is not a JSON object; no account is signed in", file.string());
    return std::nullopt;
  }
  AccountFile account;
  auto wrong = [&](std::string_view key) {
    Log::shared().error("Account file %@: field %@ has the wrong type and is ignored", file.string(), key);
  };
  auto readString = [&](std::string_view key, std::optional<std::string>& out) {
    if (const Value* v = memberNotNull(&*json, key)) {
      if (v->is_string()) out = v->get<std::string>();
      else wrong(key);
    }
  };
  auto readBool = [&](std::string_view key, std::optional<bool>& out) {
    if (const Value* v = memberNotNull(&*json, key)) {
      if (v->is_boolean()) out = v->get<bool>();
      else wrong(key);
    }
  };
  readString("personId", account.personId);
  readString("username", account.username);
  readString("serviceHost", account.serviceHost);
  readBool("provisioned", account.provisioned);
  readBool("restricted", account.restricted);
  return account;
}

std::optional<AccountFile> readAccountFileNow(const std::filesystem::path& file) {
  // Every command reads the account afresh; a file whose stamp is unchanged is not read again, and
  // a text is parsed again only when it changed.
  const FileStamp stamp = FileStamp::of(file);
  if (!stamp.exists) return std::nullopt;
  struct Parsed {
    std::filesystem::path path;
    FileStamp stamp;
    std::string text;
    std::optional<AccountFile> account;
  };
  static std::mutex mutex;
  static std::optional<Parsed> last;
  {
    std::lock_guard lock(mutex);
    if (last && last->path.native() == file.native() && stamp.unchangedSince(last->stamp)) return last->account;
  }
  auto text = readWholeFile(file, kMaxAccountBytes);
  if (!text) {
    Log::shared().error("Account file %@ cannot be read or is too large; no account is signed in", file.string());
    return std::nullopt;
  }
  {
    std::lock_guard lock(mutex);
    if (last && last->path.native() == file.native() && last->text == *text) {
      last->stamp = stamp;
      return last->account;
    }
  }
  auto account = parseAccountFile(file, *text);
  std::lock_guard lock(mutex);
  last = Parsed{file, stamp, std::move(*text), account};
  return account;
}

// The scope of this thread, if any; a plain pointer, so that the plug-in keeps no thread-local
// object that would have to be destroyed.
thread_local AccountFileReadOnce* readOnceScope = nullptr;

}  // namespace

AccountFileReadOnce::AccountFileReadOnce() noexcept : outermost_(readOnceScope == nullptr) {
  if (outermost_) readOnceScope = this;
}

AccountFileReadOnce::~AccountFileReadOnce() {
  if (outermost_) readOnceScope = nullptr;
}

std::optional<AccountFile> readAccountFile(const std::filesystem::path& file) {
  AccountFileReadOnce* const scope = readOnceScope;
  if (scope == nullptr) return readAccountFileNow(file);
  if (scope->read_ && scope->file_.native() == file.native()) return scope->account_;
  auto account = readAccountFileNow(file);
  if (!scope->read_) {  // the scope keeps the first file it sees; another is read as it is
    scope->file_ = file;
    scope->account_ = account;
    scope->read_ = true;
  }
  return account;
}

std::optional<std::string> readApplicationToken(const std::filesystem::path& tokenFile, std::time_t now) {
  if (const char* env = std::getenv("KYN_APP_TOKEN"); env != nullptr && *env != '\0') {
    std::string token = trim(env);
    if (!token.empty()) return token;
  }
  // The token last read, with the stamp of its file (of a link itself, which is refused) and the
  // user it was read as: a change of content, mode or owner changes the stamp.
  struct Read {
    std::filesystem::path path;
    FileStamp stamp;
    uid_t user;
    std::string token;
  };
  static std::mutex mutex;
  static std::optional<Read> last;
  const FileStamp stamp = FileStamp::ofLink(tokenFile, now);
  const uid_t user = ::geteuid();
  {
    std::lock_guard lock(mutex);
    if (stamp.exists && last && last->path.native() == tokenFile.native() && last->user == user &&
        stamp.unchangedSince(last->stamp)) {
      return last->token;
    }
    last.reset();
  }
  const int fd = ::open(tokenFile.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK);
  if (fd < 0) {
    if (errno != ENOENT) Log::shared().error("Token file %@ cannot be opened; no token", tokenFile.string());
    return std::nullopt;
  }
  struct stat st {};
  std::optional<std::string> token;
  if (::fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) {
    Log::shared().error("Token file %@ is not a regular file; it is not used", tokenFile.string());
  } else if (st.st_uid != user || (st.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
    char mode[8];
    std::snprintf(mode, sizeof mode, "%04o", static_cast<unsigned>(st.st_mode & 07777));
    Log::shared().error("Token file %@ may be read by others (mode %@) or belongs to another user; it is not used",
                        tokenFile.string(), mode);
  } else if (static_cast<std::size_t>(st.st_size) > kMaxTokenBytes) {
    Log::shared().error("Token file %@ is too large; it is not used", tokenFile.string());
  } else {
    std::string text(kMaxTokenBytes, '\0');
    std::size_t used = 0;
    for (;;) {
      const ssize_t n = ::read(fd, text.data() + used, text.size() - used);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) break;
      used += static_cast<std::size_t>(n);
      if (used == text.size()) break;
    }
    text.resize(used);
    std::string trimmed = trim(text);
    if (!trimmed.empty()) token = std::move(trimmed);
  }
  ::close(fd);
  if (token) {
    std::lock_guard lock(mutex);
    last = Read{tokenFile, stamp, user, *token};
  }
  return token;
}

std::optional<std::string> osReleaseField(std::string_view text, std::string_view key) {
  while (!text.empty()) {
    const auto end = text.find('\n');
    std::string_view line = text.substr(0, end);
    text = end == std::string_view::npos ? std::string_view() : text.substr(end + 1);
    if (line.size() > key.size() && line.substr(0, key.size()) == key && line[key.size()] == '=') {
      std::string value = trim(line.substr(key.size() + 1));
      if (value.size() >= 2 && (value.front() == '"' || value.front() == '\'') && value.back() == value.front()) {
        value = value.substr(1, value.size() - 2);
      }
      if (value.empty()) return std::nullopt;
      return value;
    }
  }
  return std::nullopt;
}

LinuxSystemInfo::LinuxSystemInfo(const Configuration& configuration)
    : paths_{configuration.accountFile(), configuration.tokenFile()} {}

std::optional<OwnerAccount> LinuxSystemInfo::ownerAccount() {
  auto file = readAccountFile(paths_.accountFile);
  if (!file) return std::nullopt;
  std::optional<std::string> token;
  if (file->personId) token = readApplicationToken(paths_.tokenFile);
  return OwnerAccount(file->personId, file->username, std::move(token), file->serviceHost);
}

std::optional<std::string> LinuxSystemInfo::deviceUDID() {
  sd_id128_t id;
  if (sd_id128_get_machine_app_specific(kApplicationId, &id) < 0) return std::nullopt;
  char text[SD_ID128_UUID_STRING_MAX];
  sd_id128_to_uuid_string(id, text);
  std::string out(text);
  for (char& c : out) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return out;
}

std::optional<std::string> LinuxSystemInfo::productType() {
  auto text = readWholeFile(paths_.productName, 256);
  if (!text) return std::nullopt;
  std::string name = trim(*text);
  if (name.empty()) return std::nullopt;
  return name;
}

std::optional<std::string> LinuxSystemInfo::osVersion() {
  auto text = readWholeFile(paths_.osRelease, 64 * 1024);
  if (!text) text = readWholeFile("/usr/lib/os-release", 64 * 1024);
  if (!text) return std::nullopt;
  return osReleaseField(*text, "VERSION_ID");
}

std::optional<std::string> LinuxSystemInfo::osBuildVersion() {
  if (auto text = readWholeFile(paths_.osRelease, 64 * 1024)) {
    if (auto build = osReleaseField(*text, "BUILD_ID")) return build;
  }
  struct utsname u {};
  if (::uname(&u) != 0) return std::nullopt;
  return std::string(u.release);
}

bool AccountFileSession::isProvisionedForLocationSharing() {
  auto file = readAccountFile(accountFile_);
  return file && file->personId && file->provisioned.value_or(true);
}

bool AccountFileSession::isRestricted() {
  auto file = readAccountFile(accountFile_);
  return file && file->restricted.value_or(false);
}

}  // namespace kyn::platform
