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
  std::string out;
  util->Format(number, style == PhoneNumberStyle::Canonical ? PhoneNumberUtil::E164 : PhoneNumberUtil::INTERNATIONAL,
               &out);
  if (out.empty()) return std::nullopt;
  return out;
}

}  // namespace kyn::platform
