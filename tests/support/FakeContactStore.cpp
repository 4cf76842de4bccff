#include "support/FakeContactStore.h"

#include "platform/phone/PhoneNumbers.h"
#include "platform/text/Unicode.h"

#include <algorithm>

namespace kyn::test {

using platform::Contact;
using platform::ContactKeys;

platform::Contact& FakeContactStore::add(std::string identifier) {
  std::lock_guard lock(mutex_);
  contacts_.emplace_back();
  contacts_.back().identifier = std::move(identifier);
  return contacts_.back();
}

FakeContactStore::Contacts FakeContactStore::matching(const ContactKeys& keys,
                                                      const std::function<bool(const Contact&)>& wanted) {
  ++queries;
  std::lock_guard lock(mutex_);
  lastKeys = keys;
  Contacts out;
  for (const auto& c : contacts_) {
    if (wanted(c)) out.push_back(std::make_shared<const Contact>(platform::projectContact(c, keys)));
  }
  return out;
}

FakeContactStore::Contacts FakeContactStore::unifiedContactsMatchingEmailAddress(std::string_view emailAddress,
                                                                                 const ContactKeys& keys, std::string*) {
  const std::string wanted = platform::foldCase(emailAddress);
  return matching(keys, [&](const Contact& c) {
    return std::any_of(c.emailAddresses.begin(), c.emailAddresses.end(),
                       [&](const auto& e) { return platform::foldCase(e.value) == wanted; });
  });
}

FakeContactStore::Contacts FakeContactStore::unifiedContactsMatchingPhoneNumber(std::string_view phoneNumber,
                                                                                const ContactKeys& keys, std::string*) {
  auto canonical = [](std::string_view s) {
    return platform::formatPhoneNumber(s, "us", platform::PhoneNumberStyle::Canonical).value_or(std::string(s));
  };
  const std::string wanted = canonical(phoneNumber);
  return matching(keys, [&](const Contact& c) {
    return std::any_of(c.phoneNumbers.begin(), c.phoneNumbers.end(),
                       [&](const auto& p) { return canonical(p.value) == wanted; });
  });
}

std::shared_ptr<const Contact> FakeContactStore::unifiedContactWithIdentifier(std::string_view identifier,
                                                                             const ContactKeys& keys, std::string*) {
  const auto found = matching(keys, [&](const Contact& c) { return c.identifier == identifier; });
  return found.empty() ? nullptr : found.front();
}

FakeContactStore::Contacts FakeContactStore::unifiedContactsMatchingName(std::string_view name, const ContactKeys& keys,
                                                                         std::string*) {
  return matching(keys, [&](const Contact& c) { return platform::contactMatchesName(c, name, "en_US"); });
}

platform::ImageBytes tinyPicture() {
  static const std::string pgm = std::string("P5\n2 1\n255\n") + '\x10' + '\xF0';
  return std::make_shared<const std::vector<std::uint8_t>>(pgm.begin(), pgm.end());
}

}  // namespace kyn::test
