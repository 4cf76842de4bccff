#pragma once

#include "platform/contacts/ContactStore.h"

#include <atomic>
#include <functional>
#include <mutex>
#include <vector>

namespace kyn::test {

/// An address book held in memory. E-mail addresses match ignoring case; phone numbers match when
/// their canonical forms in the US agree, or as texts. Counts every query and keeps the last keys.
class FakeContactStore final : public platform::ContactStore {
 public:
  using Contacts = std::vector<std::shared_ptr<const platform::Contact>>;

  /// Adds a contact and returns it for further setting.
  platform::Contact& add(std::string identifier);

  // A prepared key set is read as its keys.
  using platform::ContactStore::unifiedContactsMatchingEmailAddress;
  using platform::ContactStore::unifiedContactsMatchingName;
  using platform::ContactStore::unifiedContactsMatchingPhoneNumber;
  using platform::ContactStore::unifiedContactWithIdentifier;

  Contacts unifiedContactsMatchingEmailAddress(std::string_view emailAddress, const platform::ContactKeys& keys,
                                               std::string* error) override;
  Contacts unifiedContactsMatchingPhoneNumber(std::string_view phoneNumber, const platform::ContactKeys& keys,
                                              std::string* error) override;
  std::shared_ptr<const platform::Contact> unifiedContactWithIdentifier(std::string_view identifier,
                                                                        const platform::ContactKeys& keys,
                                                                        std::string* error) override;
  Contacts unifiedContactsMatchingName(std::string_view name, const platform::ContactKeys& keys,
                                       std::string* error) override;

  std::atomic<int> queries{0};
  platform::ContactKeys lastKeys;

 private:
  Contacts matching(const platform::ContactKeys& keys, const std::function<bool(const platform::Contact&)>& wanted);

  std::mutex mutex_;
  std::vector<platform::Contact> contacts_;
};

/// A valid 2x1 grey picture (binary PGM), for contacts that need a photo.
[[nodiscard]] platform::ImageBytes tinyPicture();

}  // namespace kyn::test
