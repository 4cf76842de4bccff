// The handle operations of the account context: an assistant person becomes the handles that the
// server knows friends by, phone numbers in canonical form.
#include "account/Common.h"
#include "contacts/ContactsUtilities.h"
#include "platform/Services.h"
#include "platform/phone/PhoneNumbers.h"
#include "platform/text/Unicode.h"

namespace kyn {

namespace {

bool isPhoneCharacter(char32_t c) {
  return platform::isDecimalDigit(c) || c == U'+' || c == U'(' || c == U')' || c == U'*' || c == U'#' || c == U'-';
}

}  // namespace

std::string Common::defaultCountryCode() {
  return platform::phoneRegionOfLocale(*platform::services().locale.get());
}

std::optional<std::string> Common::completeNumberForPhoneNumber(const std::optional<std::string>& raw) const {
  if (!raw) return std::nullopt;
  // Only leading junk ("Mobile: ", "ext. ") is cut; whatever follows the first phone character is
  // left to the parser. A text that starts with one (the usual case) is kept without a scan; a
  // first byte of a longer UTF-8 sequence is no phone character as a code point either.
  const auto first = static_cast<unsigned char>(raw->empty() ? 0 : raw->front());
  std::optional<std::string> cut;  // made only when there is junk to cut
  if (!isPhoneCharacter(first)) cut = platform::suffixFromFirstMatch(*raw, isPhoneCharacter);
  const std::string_view kept = cut ? std::string_view(*cut) : std::string_view(*raw);
  if (kept.empty()) return std::string();
  if (auto canonical = platform::formatPhoneNumber(kept, defaultCountryCode(), platform::PhoneNumberStyle::Canonical)) {
    return canonical;
  }
  return std::string(kept);
}

std::vector<std::string> Common::handlesForAXPerson(const AXPerson& person) const {
  std::vector<std::string> handles;
  appendHandlesForAXPerson(person, handles);
  return handles;
}

void Common::appendHandlesForAXPerson(const AXPerson& person, std::vector<std::string>& handles) const {
  const std::size_t first = handles.size();
  if (person.phones) {
    for (const auto& phone : *person.phones) {
      if (!phone) continue;
      if (auto number = completeNumberForPhoneNumber(phone->number)) handles.push_back(std::move(*number));
    }
  }
  // The contact's numbers stand in only when the person brought none of its own.
  if (handles.size() == first) {
    const auto contact = ContactsUtilities::contactForAssistantId(person.identifier);
    for (const auto& number : ContactsUtilities::phoneNumbersForContact(contact)) {
      if (auto completed = completeNumberForPhoneNumber(number)) handles.push_back(std::move(*completed));
    }
  }
  // E-mail addresses go as the person holds them; entries without an address are skipped.
  if (person.emails) {
    for (const auto& email : *person.emails) {
      if (email && email->emailAddress) handles.push_back(*email->emailAddress);
    }
  }
}

}  // namespace kyn
