#include "platform/phone/PhoneNumbers.h"

#include <phonenumbers/phonenumber.pb.h>
#include <phonenumbers/phonenumberutil.h>

#include <cctype>
#include <cstring>
#include <list>
#include <mutex>
#include <unordered_map>

namespace kyn::platform {

namespace {

/// Reads and writes one number; the work behind `formatPhoneNumber`.
std::optional<std::string> readAndWrite(std::string_view text, std::string_view region, PhoneNumberStyle style);

/// The last results, most recent first. Every command reads its friends' numbers again, and the
/// parser takes some 20 µs a number, so the most recent results are kept: enough for the numbers of
/// a large friends list, each entry about a hundred bytes. A list longer than the cache would miss
/// on every number, as the least recent one is always the next one read.
class ResultCache {
 public:
  std::optional<std::optional<std::string>> find(std::string_view key) {
    std::lock_guard lock(mutex_);
    const auto it = index_.find(key);
    if (it == index_.end()) return std::nullopt;
    order_.splice(order_.begin(), order_, it->second);
    return it->second->second;
  }
  void insert(std::string key, std::optional<std::string> result) {
    std::lock_guard lock(mutex_);
    if (index_.count(key) != 0) return;
    order_.emplace_front(std::move(key), std::move(result));
    index_.emplace(order_.front().first, order_.begin());
    if (order_.size() > kCapacity) {
      index_.erase(order_.back().first);
      order_.pop_back();
    }
  }

 private:
  static constexpr std::size_t kCapacity = 8192;
  using Entry = std::pair<std::string, std::optional<std::string>>;
  std::mutex mutex_;
  std::list<Entry> order_;
  std::unordered_map<std::string_view, std::list<Entry>::iterator> index_;
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
