#pragma once

#include "platform/fs/Files.h"
#include "platform/prefs/PreferencesStore.h"

#include <filesystem>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// One JSON object per domain in `directory`/<domain>.json. A write locks <domain>.json.lock, re-reads
/// the file, applies the pending changes, writes the result into the lock file itself and renames that
/// over the domain's file (fsync before and after). So a crash leaves the old or the new content and
/// nothing but these two files, and two processes lose no update. A file that does not parse reads as
/// empty (logged once) and is replaced by the next write. Domain names other than [A-Za-z0-9._-] (or
/// starting with a dot) are refused.
class FilePreferencesStore final : public PreferencesStore {
 public:
  explicit FilePreferencesStore(std::filesystem::path directory);

  std::optional<Value> value(std::string_view domain, std::string_view key) override;
  void setValue(std::string_view domain, std::string_view key, std::optional<Value> value) override;
  bool synchronize(std::string_view domain) override;

  [[nodiscard]] std::filesystem::path fileForDomain(std::string_view domain) const;

 private:
  struct Domain {
    std::filesystem::path file;
    std::optional<FileStamp> stamp;  // of the content below; nothing until first read
    Value content = Value::object();
    std::map<std::string, std::optional<Value>, std::less<>> pending;
    bool swept = false;  // earlier versions' temporaries removed
  };

  static bool isValidDomain(std::string_view domain) noexcept;
  Value readFile(const std::filesystem::path& file, bool logCorruption);
  /// The domain's state, made on first use; the caller holds the lock.
  Domain& domainNamed(std::string_view domainName);
  void refresh(Domain& domain);

  std::filesystem::path directory_;
  std::mutex mutex_;
  std::map<std::string, Domain, std::less<>> domains_;
};

}  // namespace kyn::platform
