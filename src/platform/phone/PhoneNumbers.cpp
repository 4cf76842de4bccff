#include "platform/phone/PhoneNumbers.h"

#include "platform/phone/ResultCache.h"

#include <phonenumbers/phonenumber.pb.h>
#include <phonenumbers/phonenumberutil.h>

#include <cctype>
#include <cstring>

namespace kyn::platform {

namespace {

/// Reads and writes one number; the work behind `formatPhoneNumber`.
std::optional<std::string> readAndWrite(std::string_view text, std::string_view region, PhoneNumberStyle style);

}  // namespace

std::optional<std::string> formatPhoneNumber(std::string_view text, std::string_view region, PhoneNumberStyle style) {
  // The parser's own limit is 250 characters; longer texts are no phone number anyway.
  if (text.empty() || text.size() > 250) return std::nullopt;
  static ResultCache<8192> cache;
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
  if (auto cached = cache.find(keyView)) return std::move(*cached);
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
