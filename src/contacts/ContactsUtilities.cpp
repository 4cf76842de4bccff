#include "contacts/ContactsUtilities.h"

#include "platform/Services.h"

namespace kyn {

using platform::services;
using ContactRef = ContactsUtilities::ContactRef;

std::shared_ptr<platform::ContactStore> ContactsUtilities::contactStore() { return services().contactStore.get(); }

platform::ContactKeys ContactsUtilities::contactKeys() {
  using namespace platform::ContactKey;
  // Every phonetic part but the family name is asked for; the list is kept exactly so.
  return {std::string(FullNameFormatterKeys), std::string(NamePrefix),      std::string(GivenName),
          std::string(MiddleName),            std::string(FamilyName),      std::string(PreviousFamilyName),
          std::string(NameSuffix),            std::string(Nickname),        std::string(PhoneticGivenName),
          std::string(PhoneticMiddleName),    std::string(OrganizationName), std::string(DepartmentName),
          std::string(JobTitle),              std::string(Birthday),        std::string(NonGregorianBirthday),
          std::string(Note),                  std::string(ImageCropRect),   std::string(ImageData),
          std::string(ThumbnailImageData),    std::string(PreferredLikenessSource),
          std::string(PreferredPersonaIdentifier), std::string(ContactType), std::string(PhoneNumbers),
          std::string(EmailAddresses),        std::string(PostalAddresses), std::string(Dates),
          std::string(UrlAddresses),          std::string(Relations),       std::string(SocialProfiles),
          std::string(InstantMessageAddresses)};
}

namespace {

/// The key list of every look-up, made once, so that the store reads it once.
const platform::ContactKeySet& fetchKeys() {
  static const platform::ContactKeySet keys(ContactsUtilities::contactKeys());
  return keys;
}

}  // namespace

ContactRef ContactsUtilities::contactForEmail(const std::optional<std::string>& emailAddress) {
  auto store = contactStore();
  if (!store || !emailAddress || emailAddress->empty()) return nullptr;
  std::string error;  // a failed query yields no match; the error itself is not reported
  const auto matches = store->unifiedContactsMatchingEmailAddress(*emailAddress, fetchKeys(), &error);
  return findOptimalContactInContacts(&matches);
}

ContactRef ContactsUtilities::contactForPhone(const std::optional<std::string>& phoneNumber) {
  auto store = contactStore();
  if (!store || !phoneNumber || phoneNumber->empty()) return nullptr;
  std::string error;
  const auto matches = store->unifiedContactsMatchingPhoneNumber(*phoneNumber, fetchKeys(), &error);
  return findOptimalContactInContacts(&matches);
}

std::vector<ContactRef> ContactsUtilities::contactsForName(const std::string& name) {
  auto store = contactStore();
  if (!store || name.empty()) return {};
  std::string error;
  return store->unifiedContactsMatchingName(name, fetchKeys(), &error);
}

ContactRef ContactsUtilities::contactForAssistantId(const std::optional<std::string>& assistantIdentifier) {
  if (!assistantIdentifier) return nullptr;
  const auto identifier = platform::contactIdentifierForAssistantIdentifier(*assistantIdentifier);
  if (!identifier) return nullptr;
  auto store = contactStore();
  if (!store) return nullptr;
  return store->unifiedContactWithIdentifier(*identifier, fetchKeys(), nullptr);
}

void ContactsUtilities::fillPersonFromContact(const platform::Contact& contact, AXPerson& person) {
  person.firstName = contact.givenName;
  person.lastName = contact.familyName;
  person.fullName = platform::fullNameOfContact(contact, services().locale.get()->localeId());
  person.identifier = platform::assistantIdentifierForContactIdentifier(contact.identifier);
}

ContactRef ContactsUtilities::findOptimalContactInContacts(const std::vector<ContactRef>* contacts) {
  if (contacts == nullptr || contacts->empty()) return nullptr;
  const ContactRef& first = contacts->front();
  if (contacts->size() < 2) return first;
  for (const auto& contact : *contacts) {
    if (contact && contact->imageData) return contact;
  }
  return first;
}

std::shared_ptr<const platform::Image> ContactsUtilities::imageForContact(const ContactRef& contact) {
  if (!contact) return nullptr;
  return platform::imageFromData(contact->imageData);
}

std::vector<std::string> ContactsUtilities::phoneNumbersForContact(const ContactRef& contact) {
  std::vector<std::string> numbers;
  if (!contact) return numbers;
  numbers.reserve(contact->phoneNumbers.size());
  for (const auto& phone : contact->phoneNumbers) numbers.push_back(phone.value);
  return numbers;
}

}  // namespace kyn
