#pragma once

#include "platform/assistant/Model.h"
#include "platform/contacts/ContactStore.h"
#include "platform/image/Image.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace kyn {

/// Finds the user's own contact for a friend: by e-mail address, by phone number or by the
/// assistant identifier a person carries; gives a contact's picture and phone numbers. Every
/// failure (no store, no match, an unknown identifier) yields nothing.
class ContactsUtilities {
 public:
  ContactsUtilities() = delete;

  using ContactRef = std::shared_ptr<const platform::Contact>;

  /// The best contact with this e-mail address; nothing for an absent or empty address.
  [[nodiscard]] static ContactRef contactForEmail(const std::optional<std::string>& emailAddress);
  /// The best contact with this phone number; nothing for an absent or empty number.
  [[nodiscard]] static ContactRef contactForPhone(const std::optional<std::string>& phoneNumber);
  /// The contact behind an assistant person's identifier URL.
  [[nodiscard]] static ContactRef contactForAssistantId(const std::optional<std::string>& assistantIdentifier);
  /// Every contact whose name holds `name`, ignoring case; empty for an empty name.
  [[nodiscard]] static std::vector<ContactRef> contactsForName(const std::string& name);
  /// The contact's full picture decoded; nothing without one or when it does not decode.
  [[nodiscard]] static std::shared_ptr<const platform::Image> imageForContact(const ContactRef& contact);
  /// The contact's phone numbers as written, labels dropped, duplicates kept; empty for none.
  [[nodiscard]] static std::vector<std::string> phoneNumbersForContact(const ContactRef& contact);
  /// The process's address book (may be absent).
  [[nodiscard]] static std::shared_ptr<platform::ContactStore> contactStore();
  /// The 30 properties every fetch asks for, in their fixed order; a new list on each call.
  [[nodiscard]] static platform::ContactKeys contactKeys();
  /// Gives a person the contact's names (given, family, full) and its assistant identifier.
  static void fillPersonFromContact(const platform::Contact& contact, AXPerson& person);
  /// Of several matches the first with a full picture (thumbnails do not count), otherwise the first.
  [[nodiscard]] static ContactRef findOptimalContactInContacts(const std::vector<ContactRef>* contacts);
};

}  // namespace kyn
