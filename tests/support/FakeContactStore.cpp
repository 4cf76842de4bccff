#include "support/FakeContactStore.h"

#include "platform/phone/PhoneNumbers.h"
#include "platform/text/Unicode.h"

namespace kyn::test {

using platform::Contact;
using platform::ContactKeys;

platform::Contact& FakeContactStore::add(std::string identifier) {
  std::lock_guard lock(mutex_);
  contacts_.emplace_back();
  contacts_.back().identifier = std::move(identifier);
  return contacts_.back();
}

std::vector<std::shared_ptr<const Contact>> FakeContactStore::unifiedContactsMatchingEmailAddress(
    std::string_view emailAddress, const ContactKeys& keys, std::string* /*error*/) {
  ++queries;
  std::lock_guard lock(mutex_);
  lastKeys = keys;
  std::vector<std::shared_ptr<const Contact>> out;
  const std::string wanted = platform::foldCase(emailAddress);
  for (const auto& c : contacts_) {
    for (const auto& e : c.emailAddresses) {
      if (platform::foldCase(e.value) == wanted) {
        out.push_back(std::make_shared<const Contact>(platform::projectContact(c, keys)));
        break;
      }
    }
  }
  return out;
}

std::vector<std::shared_ptr<const Contact>> FakeContactStore::unifiedContactsMatchingPhoneNumber(
    std::string_view phoneNumber, const ContactKeys& keys, std::string* /*error*/) {
  ++queries;
  std::lock_guard lock(mutex_);
  lastKeys = keys;
  auto canonical = [](std::string_view s) {
    return platform::formatPhoneNumber(s, "us", platform::PhoneNumberStyle::Canonical).value_or(std::string(s));
  };
  const std::string wanted = canonical(phoneNumber);
  std::vector<std::shared_ptr<const Contact>> out;
  for (const auto& c : contacts_) {
    for (const auto& p : c.phoneNumbers) {
      if (canonical(p.value) == wanted) {
        out.push_back(std::make_shared<const Contact>(platform::projectContact(c, keys)));
        break;
      }
    }
  }
  return out;
}

std::shared_ptr<const Contact> FakeContactStore::unifiedContactWithIdentifier(std::string_view identifier,
                                                                             const ContactKeys& keys,
                                                                             std::string* /*error*/) {
  ++queries;
  std::lock_guard lock(mutex_);
  lastKeys = keys;
  for (const auto& c : contacts_) {
    if (c.identifier == identifier) return std::make_shared<const Contact>(platform::projectContact(c, keys));
  }
  return nullptr;
}

std::vector<std::shared_ptr<const Contact>> FakeContactStore::unifiedContactsMatchingName(std::string_view name,
                                                                                       const ContactKeys& keys,
                                                                                       std::string* /*error*/) {
  ++queries;
  std::lock_guard lock(mutex_);
  lastKeys = keys;
  std::vector<std::shared_ptr<const Contact>> out;
  for (const auto& c : contacts_) {
    if (platform::contactMatchesName(c, name, "en_US")) {
      out.push_back(std::make_shared<const Contact>(platform::projectContact(c, keys)));
    }
  }
  return out;
}

platform::ImageBytes tinyPicture() {
  static const std::string pgm = std::string("P5\n2 1\n255\n") + '\x10' + '\xF0';
  return std::make_shared<const std::vector<std::uint8_t>>(pgm.begin(), pgm.end());
}

}  // namespace kyn::test
