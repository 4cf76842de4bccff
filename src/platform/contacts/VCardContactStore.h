#pragma once

#include "platform/contacts/ContactStore.h"

#include <cstddef>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

/// The address book in vCard files (2.1, 3.0 and 4.0): a folder holding .vcf files (one or more
/// cards each, the layout that CardDAV sync tools write) or a single .vcf file. Loaded on first use
/// and indexed by e-mail address, phone number and identifier, so that no look-up scans the cards.
/// A file that cannot be read or a card that does not parse is skipped with one log line; whatever
/// else a file holds that cannot be read is logged in one line for the file.
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
  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingEmailAddress(std::string_view emailAddress,
                                                                                  const ContactKeySet& keys,
                                                                                  std::string* error) override;
  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingPhoneNumber(std::string_view phoneNumber,
                                                                                 const ContactKeySet& keys,
                                                                                 std::string* error) override;
  std::shared_ptr<const Contact> unifiedContactWithIdentifier(std::string_view identifier, const ContactKeySet& keys,
                                                              std::string* error) override;
  std::vector<std::shared_ptr<const Contact>> unifiedContactsMatchingName(std::string_view name,
                                                                          const ContactKeySet& keys,
                                                                          std::string* error) override;

  /// Loads now (otherwise the first look-up does). Returns the number of unified contacts.
  std::size_t load();

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace kyn::platform
