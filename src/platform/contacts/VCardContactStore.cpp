#include "platform/contacts/VCardContactStore.h"
#include "platform/Services.h"

#include "platform/contacts/VCard.h"
#include "platform/log/Log.h"
#include "platform/phone/PhoneNumbers.h"
#include "platform/text/StringEscapes.h"
#include "platform/text/SameText.h"
#include "platform/text/Unicode.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <functional>
#include <mutex>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

namespace kyn::platform {
namespace {

namespace fs = std::filesystem;

constexpr std::uint64_t kMaxFileBytes = std::uint64_t{64} << 20;

/// Hashes index keys as views, so that a look-up needs no string of its own.
struct KeyHash {
  using is_transparent = void;
  std::size_t operator()(std::string_view key) const noexcept { return std::hash<std::string_view>{}(key); }
};
template <class Value>
using KeyedBy = std::unordered_map<std::string, Value, KeyHash, std::equal_to<>>;
using ContactIndex = KeyedBy<std::vector<std::uint32_t>>;

std::string_view trim(std::string_view text) {
  constexpr std::string_view kSpace = " \t\r\n";
  const std::size_t first = text.find_first_not_of(kSpace);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kSpace) - first + 1);
}

// E-mail addresses compare ignoring case; ASCII (nearly all of them) folds without ICU, on the
// stack when the address is no longer than an address may be.
class EmailKey {
 public:
  explicit EmailKey(std::string_view address) {
    address = trim(address);
    if (address.size() <= buffer_.size() &&
        std::all_of(address.begin(), address.end(), [](char c) { return static_cast<unsigned char>(c) < 0x80; })) {
      std::transform(address.begin(), address.end(), buffer_.begin(),
                     [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
      key_ = std::string_view(buffer_.data(), address.size());
    } else {
      folded_ = foldCase(address);
      key_ = folded_;
    }
  }
  EmailKey(const EmailKey&) = delete;
  EmailKey& operator=(const EmailKey&) = delete;
  [[nodiscard]] std::string_view view() const noexcept { return key_; }

 private:
  std::array<char, 254> buffer_;  // the longest address that a mail system takes
  std::string folded_;
  std::string_view key_;
};

std::string emailKey(std::string_view address) { return std::string(EmailKey(address).view()); }

// A number in its canonical form; a text that is no phone number ("BusinessPhone") stands for itself.
std::string phoneKey(std::string_view number, const std::string& region) {
  number = trim(number);
  if (auto canonical = formatPhoneNumber(number, region, PhoneNumberStyle::Canonical)) return *canonical;
  return std::string(number);
}

// The name that identifies a file in card identifiers: its path in the book, percent-escaped when
// it is not UTF-8 (file names on Linux are bytes), so that identifiers are always text.
std::string sourceNameOf(const fs::path& relative) {
  std::string name = relative.generic_string();
  return isValidUtf8(name) ? name : encodeToPercentEscape(name);
}

bool hasVCardExtension(const fs::path& path) {
  std::string extension = path.extension().string();
  for (char& c : extension) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return extension == ".vcf";
}

// The whole file, or nothing with the reason in `reason`. Only regular files up to 64 MiB are read;
// the file is opened without blocking so that a FIFO cannot stall the load.
std::optional<std::string> readFile(const fs::path& path, std::string& reason) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (fd < 0) {
    reason = std::strerror(errno);
    return std::nullopt;
  }
  struct Closer {
    int fd;
    ~Closer() { ::close(fd); }
  } closer{fd};
  struct stat info {};
  if (::fstat(fd, &info) != 0) {
    reason = std::strerror(errno);
    return std::nullopt;
  }
  if (!S_ISREG(info.st_mode)) {
    reason = "not a regular file";
    return std::nullopt;
  }
  if (static_cast<std::uint64_t>(info.st_size) > kMaxFileBytes) {
    reason = "larger than 64 MiB";
    return std::nullopt;
  }
  std::string text;
  text.resize(static_cast<std::size_t>(info.st_size));
  std::size_t used = 0;
  for (;;) {
    if (used == text.size()) {
      if (text.size() >= kMaxFileBytes) {  // grew while being read
        reason = "larger than 64 MiB";
        return std::nullopt;
      }
      text.resize(std::min<std::size_t>(std::max<std::size_t>(text.size() * 2, 4096), kMaxFileBytes + 1));
    }
    const ssize_t n = ::read(fd, text.data() + used, text.size() - used);
    if (n < 0) {
      if (errno == EINTR) continue;
      reason = std::strerror(errno);
      return std::nullopt;
    }
    if (n == 0) break;
    used += static_cast<std::size_t>(n);
  }
  text.resize(used);
  return text;
}

// The entries of a unified contact's lists, kept while the book loads so that unifying many cards
// into one stays linear.
using SeenEntries = std::array<std::unordered_set<std::string>, 8>;

std::array<std::vector<LabeledValue>*, 8> listsOf(Contact& c) {
  return {&c.phoneNumbers, &c.emailAddresses, &c.postalAddresses, &c.dates,
          &c.urlAddresses, &c.relations,      &c.socialProfiles,  &c.instantMessageAddresses};
}

std::string entryKey(const LabeledValue& v) {
  return (v.label ? "1" + *v.label : std::string("0")) + '\0' + v.value;
}

// Adds a later card's values to the contact unified so far: scalars that it still lacks, list
// entries that it does not hold yet, the pictures when it has none.
void unify(Contact& into, Contact&& from, std::unique_ptr<SeenEntries>& seen) {
  auto scalar = [](std::optional<std::string>& a, std::optional<std::string>& b) {
    if (!a && b) a = std::move(b);
  };
  scalar(into.namePrefix, from.namePrefix);
  scalar(into.givenName, from.givenName);
  scalar(into.middleName, from.middleName);
  scalar(into.familyName, from.familyName);
  scalar(into.previousFamilyName, from.previousFamilyName);
  scalar(into.nameSuffix, from.nameSuffix);
  scalar(into.nickname, from.nickname);
  scalar(into.phoneticGivenName, from.phoneticGivenName);
  scalar(into.phoneticMiddleName, from.phoneticMiddleName);
  scalar(into.phoneticFamilyName, from.phoneticFamilyName);
  scalar(into.organizationName, from.organizationName);
  scalar(into.departmentName, from.departmentName);
  scalar(into.jobTitle, from.jobTitle);
  scalar(into.birthday, from.birthday);
  scalar(into.note, from.note);
  scalar(into.formattedName, from.formattedName);
  if (from.contactType == ContactType::Organization) into.contactType = ContactType::Organization;
  if (!into.imageData) into.imageData = std::move(from.imageData);
  if (!into.thumbnailImageData) into.thumbnailImageData = std::move(from.thumbnailImageData);

  const auto intoLists = listsOf(into);
  const auto fromLists = listsOf(from);
  if (!seen) {
    seen = std::make_unique<SeenEntries>();
    for (std::size_t i = 0; i < intoLists.size(); ++i) {
      for (const LabeledValue& v : *intoLists[i]) (*seen)[i].insert(entryKey(v));
    }
  }
  for (std::size_t i = 0; i < intoLists.size(); ++i) {
    for (LabeledValue& v : *fromLists[i]) {
      if ((*seen)[i].insert(entryKey(v)).second) intoLists[i]->push_back(std::move(v));
    }
  }
}

/// `a == b` for key lists, which are asked for on every look-up: short texts compared in place.
bool sameKeys(const ContactKeys& a, const ContactKeys& b) noexcept {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](const std::string& x, const std::string& y) { return sameText(x, y); });
}

void addToIndex(ContactIndex& index, std::string key, std::uint32_t position) {
  if (key.empty()) return;
  auto& positions = index[std::move(key)];
  if (positions.empty() || positions.back() != position) positions.push_back(position);
}

}  // namespace

struct VCardContactStore::Impl {
  fs::path path;
  std::string region;

  std::once_flag loadOnce;
  std::vector<std::shared_ptr<const Contact>> contacts;  // in book order, unified
  ContactIndex byEmail;
  KeyedBy<std::uint32_t> byIdentifier;

  // Reading numbers is most of the cost of indexing, so the phone index waits for its first use.
  std::once_flag phoneIndexOnce;
  ContactIndex byPhone;

  // Every look-up of a command asks for the same keys: they are read once for all of them. A key set
  // that was read is known again by its number.
  std::mutex projectionMutex;
  std::shared_ptr<const ContactProjection> lastProjection;
  std::uint64_t lastSet = 0;  // the set whose keys `lastProjection` holds; 0 for none

  std::shared_ptr<const ContactProjection> projectionFor(const ContactKeys& keys) {
    std::lock_guard lock(projectionMutex);
    if (!lastProjection || !sameKeys(lastProjection->keys(), keys)) {
      lastProjection = std::make_shared<const ContactProjection>(keys);
      lastSet = 0;
    }
    return lastProjection;
  }
  std::shared_ptr<const ContactProjection> projectionFor(const ContactKeySet& set) {
    std::lock_guard lock(projectionMutex);
    if (lastProjection && lastSet == set.id()) return lastProjection;
    if (!lastProjection || !sameKeys(lastProjection->keys(), set.keys())) {
      lastProjection = std::make_shared<const ContactProjection>(set.keys());
    }
    lastSet = set.id();
    return lastProjection;
  }

  /// Notes in `*error` a key that names no property.
  static void reportUnknownKey(const ContactProjection& projection, std::string* error) {
    if (!projection.unknownKey().empty() && error != nullptr) *error = "Unknown contact key: " + projection.unknownKey();
  }

  void ensureLoaded() {
    std::call_once(loadOnce, [this] { loadBook(); });
  }

  void ensurePhoneIndex() {
    ensureLoaded();
    std::call_once(phoneIndexOnce, [this] { indexPhones(); });
  }

  // The .vcf files of the book in sorted order: the file itself, or every one below the folder.
  std::vector<std::pair<fs::path, std::string>> bookFiles() {
    std::vector<std::pair<fs::path, std::string>> files;
    std::error_code ec;
    const fs::file_status status = fs::status(path, ec);
    if (!fs::exists(status)) {
      if (ec && ec != std::errc::no_such_file_or_directory && ec != std::errc::not_a_directory) {
        Log::shared().error("Contacts: the address book %@ cannot be read: %@", path.string(), ec.message());
      } else {
        Log::shared().info("Contacts: no address book at %@", path.string());
      }
      return files;
    }
    if (!fs::is_directory(status)) {
      files.emplace_back(path, sourceNameOf(path.filename()));
      return files;
    }
    fs::recursive_directory_iterator it(path, fs::directory_options::skip_permission_denied, ec);
    if (ec) {
      Log::shared().error("Contacts: the folder %@ cannot be read: %@", path.string(), ec.message());
      return files;
    }
    for (; it != fs::recursive_directory_iterator(); it.increment(ec)) {
      if (ec) {
        Log::shared().error("Contacts: the folder %@ cannot be read completely: %@", path.string(), ec.message());
        break;
      }
      std::error_code typeError;
      if (!hasVCardExtension(it->path()) || it->is_directory(typeError)) continue;
      files.emplace_back(it->path(), sourceNameOf(it->path().lexically_relative(path)));
    }
    std::sort(files.begin(), files.end(), [](const auto& a, const auto& b) { return a.second < b.second; });
    return files;
  }

  void loadBook() noexcept {
    try {
      std::vector<Contact> book;
      std::vector<std::unique_ptr<SeenEntries>> seen;  // beside `book`, for contacts of several cards
      std::unordered_map<std::string, std::size_t> positionOfIdentifier;
      std::size_t fileCount = 0;
      for (const auto& [file, sourceName] : bookFiles()) {
        std::string reason;
        const auto text = readFile(file, reason);
        if (!text) {
          Log::shared().error("Contacts: skipped the file %@: %@", file.string(), reason);
          continue;
        }
        ++fileCount;
        VCardParseResult parsed = parseVCards(*text, sourceName);
        for (const std::string& line : parsed.skipped) Log::shared().error("Contacts: skipped a card: %@", line);
        if (!parsed.unread.empty()) Log::shared().error("Contacts: %@", parsed.unread);
        for (Contact& contact : parsed.contacts) {
          const auto [it, added] = positionOfIdentifier.try_emplace(contact.identifier, book.size());
          if (added) {
            book.push_back(std::move(contact));
            seen.emplace_back();
          } else {
            unify(book[it->second], std::move(contact), seen[it->second]);
          }
        }
      }
      contacts.reserve(book.size());
      for (Contact& contact : book) {
        const auto position = static_cast<std::uint32_t>(contacts.size());
        byIdentifier.emplace(contact.identifier, position);
        for (const LabeledValue& email : contact.emailAddresses) addToIndex(byEmail, emailKey(email.value), position);
        contacts.push_back(std::make_shared<const Contact>(std::move(contact)));
      }
      Log::shared().info("Contacts: address book loaded: %ld contacts, %ld files", static_cast<long>(contacts.size()),
                         static_cast<long>(fileCount));
    } catch (const std::exception& e) {
      Log::shared().error("Contacts: the address book could not be loaded: %@", e.what());
      contacts.clear();
      byEmail.clear();
      byIdentifier.clear();
    }
  }

  void indexPhones() noexcept {
    try {
      for (std::uint32_t position = 0; position < contacts.size(); ++position) {
        for (const LabeledValue& phone : contacts[position]->phoneNumbers) {
          addToIndex(byPhone, phoneKey(phone.value, region), position);
        }
      }
    } catch (const std::exception& e) {
      Log::shared().error("Contacts: phone numbers could not be indexed: %@", e.what());
      byPhone.clear();
    }
  }

  template <class Keys>
  std::vector<std::shared_ptr<const Contact>> project(const ContactIndex& index, std::string_view key,
                                                      const Keys& keys, std::string* error) {
    std::vector<std::shared_ptr<const Contact>> out;
    const auto it = index.find(key);
    if (it == index.end()) return out;
    const auto projection = projectionFor(keys);
    out.reserve(it->second.size());
    for (const std::uint32_t position : it->second) out.push_back(projection->share(contacts[position]));
    reportUnknownKey(*projection, error);
    return out;
  }

  template <class Keys>
  std::vector<std::shared_ptr<const Contact>> withEmailAddress(std::string_view emailAddress, const Keys& keys,
                                                               std::string* error) {
    try {
      ensureLoaded();
      const EmailKey key(emailAddress);
      if (key.view().empty()) return {};
      return project(byEmail, key.view(), keys, error);
    } catch (const std::exception& e) {
      if (error != nullptr) *error = e.what();
      return {};
    }
  }

  template <class Keys>
  std::vector<std::shared_ptr<const Contact>> withPhoneNumber(std::string_view phoneNumber, const Keys& keys,
                                                              std::string* error) {
    try {
      ensurePhoneIndex();
      const std::string key = phoneKey(phoneNumber, region);
      if (key.empty()) return {};
      return project(byPhone, key, keys, error);
    } catch (const std::exception& e) {
      if (error != nullptr) *error = e.what();
      return {};
    }
  }

  template <class Keys>
  std::shared_ptr<const Contact> withIdentifier(std::string_view identifier, const Keys& keys, std::string* error) {
    try {
      ensureLoaded();
      const auto it = byIdentifier.find(identifier);
      if (it == byIdentifier.end()) return nullptr;
      const auto projection = projectionFor(keys);
      reportUnknownKey(*projection, error);
      return projection->share(contacts[it->second]);
    } catch (const std::exception& e) {
      if (error != nullptr) *error = e.what();
      return nullptr;
    }
  }

  template <class Keys>
  std::vector<std::shared_ptr<const Contact>> withName(std::string_view name, const Keys& keys, std::string* error) {
    std::vector<std::shared_ptr<const Contact>> out;
    try {
      ensureLoaded();
      // A name typed by the user is looked for once per command, so the book is scanned.
      const std::string localeId = services().locale.get()->localeId();
      const auto projection = projectionFor(keys);
      for (const auto& contact : contacts) {
        if (contactMatchesName(*contact, name, localeId)) out.push_back(projection->share(contact));
      }
      if (!out.empty()) reportUnknownKey(*projection, error);
    } catch (const std::exception& e) {
      if (error != nullptr) *error = e.what();
      out.clear();
    }
    return out;
  }
};

VCardContactStore::VCardContactStore(std::filesystem::path path, std::string phoneRegion)
    : impl_(std::make_unique<Impl>()) {
  impl_->path = std::move(path);
  impl_->region = std::move(phoneRegion);
}

VCardContactStore::~VCardContactStore() = default;

std::size_t VCardContactStore::load() {
  impl_->ensureLoaded();
  return impl_->contacts.size();
}

std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingEmailAddress(
    std::string_view emailAddress, const ContactKeys& keys, std::string* error) {
  return impl_->withEmailAddress(emailAddress, keys, error);
}
std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingEmailAddress(
    std::string_view emailAddress, const ContactKeySet& keys, std::string* error) {
  return impl_->withEmailAddress(emailAddress, keys, error);
}

std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingPhoneNumber(
    std::string_view phoneNumber, const ContactKeys& keys, std::string* error) {
  return impl_->withPhoneNumber(phoneNumber, keys, error);
}
std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingPhoneNumber(
    std::string_view phoneNumber, const ContactKeySet& keys, std::string* error) {
  return impl_->withPhoneNumber(phoneNumber, keys, error);
}

std::shared_ptr<const Contact> VCardContactStore::unifiedContactWithIdentifier(std::string_view identifier,
                                                                               const ContactKeys& keys,
                                                                               std::string* error) {
  return impl_->withIdentifier(identifier, keys, error);
}
std::shared_ptr<const Contact> VCardContactStore::unifiedContactWithIdentifier(std::string_view identifier,
                                                                               const ContactKeySet& keys,
                                                                               std::string* error) {
  return impl_->withIdentifier(identifier, keys, error);
}

std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingName(std::string_view name,
                                                                                         const ContactKeys& keys,
                                                                                         std::string* error) {
  return impl_->withName(name, keys, error);
}
std::vector<std::shared_ptr<const Contact>> VCardContactStore::unifiedContactsMatchingName(std::string_view name,
                                                                                         const ContactKeySet& keys,
                                                                                         std::string* error) {
  return impl_->withName(name, keys, error);
}

}  // namespace kyn::platform
