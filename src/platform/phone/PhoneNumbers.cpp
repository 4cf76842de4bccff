#include "platform/phone/PhoneNumbers.h"

#include <phonenumbers/phonenumber.pb.h>
#include <phonenumbers/phonenumberutil.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstring>
#include <mutex>
#include <utility>
#include <vector>

namespace kyn::platform {

namespace {

/// Reads and writes one number; the work behind `formatPhoneNumber`.
std::optional<std::string> readAndWrite(std::string_view text, std::string_view region, PhoneNumberStyle style);

/// The last results, kept while they are used. Every command reads its friends' numbers again, and
/// the parser takes some 20 µs a number, so results are kept: enough for the numbers of a large
/// friends list, each about a hundred bytes. The keys' hashes lie in one array of their own (open
/// addressing), so that a look-up reads a few cache lines and moves nothing. When the cache is full,
/// a clock hand takes the first result not used since it last passed (a second chance): close to
/// the least recently used one. A list longer than the cache misses often, as with any such cache.
class ResultCache {
 public:
  std::optional<std::optional<std::string>> find(std::string_view key) {
    const std::uint64_t hash = hashOf(key);
    std::lock_guard lock(mutex_);
    if (hashes_.empty()) return std::nullopt;
    const std::size_t at = place(key, hash);
    if (hashes_[at] == kFree) return std::nullopt;
    Entry& entry = entries_[at];
    entry.recent = true;
    return entry.result;
  }
  void insert(std::string key, std::optional<std::string> result) {
    const std::uint64_t hash = hashOf(key);
    std::lock_guard lock(mutex_);
    if (!hashes_.empty() && hashes_[place(key, hash)] != kFree) return;
    if (count_ == kCapacity) {
      evictOne();
    } else if (2 * (count_ + 1) > hashes_.size()) {
      resize(std::max<std::size_t>(64, 2 * hashes_.size()));
    }
    const std::size_t at = place(key, hash);
    hashes_[at] = hash;
    entries_[at] = Entry{std::move(key), std::move(result), true};  // new: not the next to go
    ++count_;
  }

 private:
  static constexpr std::size_t kCapacity = 8192;
  static constexpr std::uint64_t kFree = 0;  // no key's hash (`hashOf`)
  struct Entry {
    std::string key;
    std::optional<std::string> result;
    bool recent = false;  // used since the clock hand last passed
  };

  static std::uint64_t hashOf(std::string_view key) noexcept {
    const std::uint64_t hash = std::hash<std::string_view>{}(key);
    return hash == kFree ? 1 : hash;
  }
  /// The slot that holds `key`, else the free one where it goes; at least half the slots are free.
  [[nodiscard]] std::size_t place(std::string_view key, std::uint64_t hash) const noexcept {
    const std::size_t mask = hashes_.size() - 1;
    for (std::size_t i = hash & mask;; i = (i + 1) & mask) {
      if (hashes_[i] == kFree || (hashes_[i] == hash && entries_[i].key == key)) return i;
    }
  }
  void resize(std::size_t slots) {
    std::vector<std::uint64_t> hashes(slots, kFree);
    std::vector<Entry> entries(slots);
    hashes.swap(hashes_);
    entries.swap(entries_);
    for (std::size_t i = 0; i < hashes.size(); ++i) {
      if (hashes[i] == kFree) continue;
      const std::size_t at = place(entries[i].key, hashes[i]);
      hashes_[at] = hashes[i];
      entries_[at] = std::move(entries[i]);
    }
    hand_ = 0;
  }
  /// The clock hand moves to the first result not used since it last passed, and takes it out.
  void evictOne() {
    const std::size_t mask = hashes_.size() - 1;
    for (;; hand_ = (hand_ + 1) & mask) {
      if (hashes_[hand_] == kFree) continue;
      if (std::exchange(entries_[hand_].recent, false)) continue;
      erase(hand_);
      return;
    }
  }
  /// Takes out the result in slot `i`, moving back the ones after it that belong nearer their home
  /// slot, so that no look-up stops at the gap.
  void erase(std::size_t i) {
    const std::size_t mask = hashes_.size() - 1;
    hashes_[i] = kFree;
    entries_[i] = Entry{};
    --count_;
    for (std::size_t j = (i + 1) & mask; hashes_[j] != kFree; j = (j + 1) & mask) {
      const std::size_t home = hashes_[j] & mask;
      // The one at j may fill the gap at i when i lies on its way from home to j.
      if (((j - home) & mask) >= ((j - i) & mask)) {
        hashes_[i] = hashes_[j];
        entries_[i] = std::move(entries_[j]);
        hashes_[j] = kFree;
        entries_[j] = Entry{};
        i = j;
      }
    }
  }

  std::mutex mutex_;
  std::vector<std::uint64_t> hashes_;  // per slot: the key's hash, or kFree
  std::vector<Entry> entries_;         // per slot
  std::size_t count_ = 0;
  std::size_t hand_ = 0;
};

}  // namespace

std::optional<std::string> formatPhoneNumber(std::string_view text, std::string_view region, PhoneNumberStyle style) {
  // The parser's own limit is 250 characters; longer texts are no phone number anyway.
  if (text.empty() || text.size() > 250) return std::nullopt;
  static ResultCache cache;
  // The key is made on the stack: most look-ups find it, and need no copy of it.
  char stackKey[300];
  const std::size_t keySize = text.size() + region.size() + 2;
  std::string heapKey;
  char* key = stackKey;
  if (keySize > sizeof stackKey) {
    heapKey.resize(keySize);
    key = heapKey.data();
  }
  key[0] = static_cast<char>('0' + static_cast<int>(style));
  std::memcpy(key + 1, region.data(), region.size());
  key[region.size() + 1] = '\0';
  std::memcpy(key + region.size() + 2, text.data(), text.size());
  const std::string_view keyView(key, keySize);
  if (auto cached = cache.find(keyView)) return *cached;
  auto result = readAndWrite(text, region, style);
  cache.insert(std::string(keyView), result);
  return result;
}

namespace {

std::optional<std::string> readAndWrite(std::string_view text, std::string_view region, PhoneNumberStyle style) {
  using i18n::phonenumbers::PhoneNumber;
  using i18n::phonenumbers::PhoneNumberUtil;
  std::string regionCode = region.empty() ? std::string("ZZ") : std::string(region);
  for (char& c : regionCode) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));

  const PhoneNumberUtil* util = PhoneNumberUtil::GetInstance();
  PhoneNumber number;
  if (util->Parse(std::string(text), regionCode, &number) != PhoneNumberUtil::NO_PARSING_ERROR) return std::nullopt;
  // A text is a phone number only when its length is possible for its country (an area code may be
  // missing). Impossible ones, such as seventeen digits in the US, have no stable canonical text:
  // each reading strips another digit as a trunk prefix.
  const auto possible = util->IsPossibleNumberWithReason(number);
  if (possible != PhoneNumberUtil::IS_POSSIBLE && possible != PhoneNumberUtil::IS_POSSIBLE_LOCAL_ONLY) {
    return std::nullopt;
  }
  std::string out;
  if (style == PhoneNumberStyle::Display) {
    util->Format(number, PhoneNumberUtil::INTERNATIONAL, &out);
    return out.empty() ? std::nullopt : std::optional<std::string>(out);
  }
  util->Format(number, PhoneNumberUtil::E164, &out);
  // The E.164 text of a number with leading zeros may not read back as itself (zeros kept after the
  // country code the first time are dropped one per reading). Canonical texts key friends, so such a
  // result is read again until it stands still; each change shortens it, so this ends. A text that
  // never settled would be no canonical text at all. Other possible numbers read back as themselves.
  if (!number.italian_leading_zero()) return out.empty() ? std::nullopt : std::optional<std::string>(out);
  for (int round = 0;; ++round) {
    if (round > 24) return std::nullopt;
    PhoneNumber again;
    std::string next;
    if (util->Parse(out, regionCode, &again) != PhoneNumberUtil::NO_PARSING_ERROR) break;
    util->Format(again, PhoneNumberUtil::E164, &next);
    if (next == out || next.empty()) break;
    out = std::move(next);
  }
  if (out.empty()) return std::nullopt;
  return out;
}

}  // namespace
}  // namespace kyn::platform
