#include "platform/phone/PhoneNumbers.h"

#include <phonenumbers/phonenumber.pb.h>
#include <phonenumbers/phonenumberutil.h>

#include <cctype>

namespace kyn::platform {

std::optional<std::string> formatPhoneNumber(std::string_view text, std::string_view region, PhoneNumberStyle style) {
  using i18n::phonenumbers::PhoneNumber;
  using i18n::phonenumbers::PhoneNumberUtil;
  // The parser's own limit is 250 characters; longer texts are no phone number anyway.
  if (text.empty() || text.size() > 250) return std::nullopt;
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
  // The parser's E.164 text of an unusual number may not read back as itself (zeros kept after the
  // country code the first time are dropped one per reading). Canonical texts key friends, so the
  // result is read again until it stands still; each change shortens it, so this ends. A text that
  // never settled would be no canonical text at all.
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

}  // namespace kyn::platform
