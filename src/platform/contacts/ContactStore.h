#pragma once

#include "platform/contacts/Contact.h"

#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

/// The user's address book. Look-ups return unified contacts, in the book's order, holding the
/// properties that `keys` name; `error` (when given) receives a description of a failed query.
/// Thread-safe.
class ContactStore {
 public:
  virtual ~ContactStore() = default;

  /// Every contact with this e-mail address; addresses are compared ignoring case.
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingEmailAddress(
      std::string_view emailAddress, const ContactKeys& keys, std::string* error) = 0;

  /// Every contact with this phone number. Numbers are compared as numbers: both sides are read
  /// with the phone-number parser in the default country, so "(408) 555-0100" matches
  /// "+1 408-555-0100" in the US; texts that are no phone number match their own text.
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingPhoneNumber(
      std::string_view phoneNumber, const ContactKeys& keys, std::string* error) = 0;

  /// The contact with this identifier, or nothing.
  [[nodiscard]] virtual std::shared_ptr<const Contact> unifiedContactWithIdentifier(
      std::string_view identifier, const ContactKeys& keys, std::string* error) = 0;

  /// Every contact whose full name, given name, family name or nickname holds `name` (ignoring case),
  /// for an assistant that turns a spoken name into a person. May scan the book.
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingName(
      std::string_view name, const ContactKeys& keys, std::string* error) = 0;

  // The same look-ups with a key list made once for many of them, which a store may read once for
  // all: a command looks up every friend with the same keys.
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingEmailAddress(
      std::string_view emailAddress, const ContactKeySet& keys, std::string* error) {
    return unifiedContactsMatchingEmailAddress(emailAddress, keys.keys(), error);
  }
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingPhoneNumber(
      std::string_view phoneNumber, const ContactKeySet& keys, std::string* error) {
    return unifiedContactsMatchingPhoneNumber(phoneNumber, keys.keys(), error);
  }
  [[nodiscard]] virtual std::shared_ptr<const Contact> unifiedContactWithIdentifier(std::string_view identifier,
                                                                                    const ContactKeySet& keys,
                                                                                    std::string* error) {
    return unifiedContactWithIdentifier(identifier, keys.keys(), error);
  }
  [[nodiscard]] virtual std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingName(
      std::string_view name, const ContactKeySet& keys, std::string* error) {
    return unifiedContactsMatchingName(name, keys.keys(), error);
  }
};

}  // namespace kyn::platform
