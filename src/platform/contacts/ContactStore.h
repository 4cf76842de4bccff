#pragma once

#include "platform/contacts/Contact.h"

#include <filesystem>
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
};

/// The address book in vCard files (2.1, 3.0 and 4.0): a folder holding .vcf files (one or more
/// cards each, the layout that CardDAV sync tools write) or a single .vcf file. Loaded on first use
/// and indexed by e-mail address, phone number and identifier, so that no look-up scans the cards.
/// A file that cannot be read or a card that does not parse is skipped with one log line.
class VCardContactStore final : public ContactStore {
 public:
  /// `phoneRegion`: lower-case country code in which numbers without an international prefix are read.
  VCardContactStore(std::filesystem::path path, std::string phoneRegion);
  ~VCardContactStore() override;

  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingEmailAddress(std::string_view emailAddress,
                                                                                  const ContactKeys& keys,
                                                                                  std::string* error) override;
  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingPhoneNumber(std::string_view phoneNumber,
                                                                                 const ContactKeys& keys,
                                                                                 std::string* error) override;
  std::shared_ptr<const Contact> unifiedContactWithIdentifier(std::string_view identifier, const ContactKeys& keys,
                                                              std::string* error) override;
  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingName(std::string_view name,
                                                                          const ContactKeys& keys,
                                                                          std::string* error) override;

  /// Loads now (otherwise the first look-up does). Returns the number of unified contacts.
  std::size_t load();

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace kyn::platform
