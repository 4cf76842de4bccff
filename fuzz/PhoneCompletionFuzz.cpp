// Completes arbitrary text as a phone number. Completion must be idempotent (a handle completes to
// itself), the parser's canonical text must be short and stable, and the display and digit-only
// forms must never fail on any input.
#include "account/Common.h"
#include "model/KYNAXLocation.h"
#include "platform/phone/PhoneNumbers.h"
#include "platform/text/StringEscapes.h"

#include <cstddef>
#include <cstdint>
#include <string>

namespace {

bool isCanonical(const std::string& s) {
  if (s.size() < 2 || s.front() != '+') return false;
  for (std::size_t i = 1; i < s.size(); ++i) {
    if (s[i] < '0' || s[i] > '9') return false;
  }
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static kyn::Common common;
  static const auto record = kyn::KYNAXLocation::locationWithAvixLocation(nullptr);
  const std::string text(reinterpret_cast<const char*>(data), size);

  const auto completed = common.completeNumberForPhoneNumber(text);
  if (!completed) __builtin_trap();
  if (common.completeNumberForPhoneNumber(*completed) != *completed) __builtin_trap();

  using kyn::platform::PhoneNumberStyle;
  if (const auto canonical = kyn::platform::formatPhoneNumber(text, "us", PhoneNumberStyle::Canonical)) {
    // The parser reads up to 17 national digits after a country code of up to 3.
    if (!isCanonical(*canonical) || canonical->size() > 21) __builtin_trap();
    if (kyn::platform::formatPhoneNumber(*canonical, "us", PhoneNumberStyle::Canonical) != canonical) __builtin_trap();
  }
  const std::string digits = record->unformatPhoneNumber(text);
  if (!kyn::platform::isValidUtf8(digits)) __builtin_trap();
  (void)record->formatPhoneNumber(text);
  return 0;
}
