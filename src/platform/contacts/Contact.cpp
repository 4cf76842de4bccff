#include "platform/contacts/Contact.h"

#include "platform/text/StringEscapes.h"
#include "platform/text/Unicode.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <tuple>

namespace kyn::platform {
namespace {

constexpr std::string_view kAssistantIdPrefix = "x-kyn-contact:";

// Languages that write the family name first.
constexpr std::array<std::string_view, 6> kFamilyFirstLanguages = {"zh", "ja", "ko", "hu", "vi", "mn"};

bool familyNameFirst(std::string_view localeId) {
  const std::string_view language = localeId.substr(0, localeId.find_first_of("_-@"));
  return std::find(kFamilyFirstLanguages.begin(), kFamilyFirstLanguages.end(), language) != kFamilyFirstLanguages.end();
}

bool present(const std::optional<std::string>& s) { return s && !s->empty(); }

/// One property of a contact: the key that names it (none for the formatted name, which only the
/// full-name descriptor keeps) and whether the full-name formatter reads it.
template <typename T>
struct Field {
  std::string_view key;
  T Contact::*member;
  bool formatter = false;
};
using Text = std::optional<std::string>;
using Labeled = std::vector<LabeledValue>;

// Each property has the bit of its place in this list.
constexpr auto kFields = std::tuple{
    Field<ContactType>{ContactKey::ContactType, &Contact::contactType, true},
    Field<Text>{{}, &Contact::formattedName, true},
    Field<Text>{ContactKey::NamePrefix, &Contact::namePrefix, true},
    Field<Text>{ContactKey::GivenName, &Contact::givenName, true},
    Field<Text>{ContactKey::MiddleName, &Contact::middleName, true},
    Field<Text>{ContactKey::FamilyName, &Contact::familyName, true},
    Field<Text>{ContactKey::NameSuffix, &Contact::nameSuffix, true},
    Field<Text>{ContactKey::OrganizationName, &Contact::organizationName, true},
    Field<Text>{ContactKey::PreviousFamilyName, &Contact::previousFamilyName},
    Field<Text>{ContactKey::Nickname, &Contact::nickname},
    Field<Text>{ContactKey::PhoneticGivenName, &Contact::phoneticGivenName},
    Field<Text>{ContactKey::PhoneticMiddleName, &Contact::phoneticMiddleName},
    Field<Text>{ContactKey::PhoneticFamilyName, &Contact::phoneticFamilyName},
    Field<Text>{ContactKey::DepartmentName, &Contact::departmentName},
    Field<Text>{ContactKey::JobTitle, &Contact::jobTitle},
    Field<Text>{ContactKey::Birthday, &Contact::birthday},
    Field<Text>{ContactKey::Note, &Contact::note},
    Field<ImageBytes>{ContactKey::ImageData, &Contact::imageData},
    Field<ImageBytes>{ContactKey::ThumbnailImageData, &Contact::thumbnailImageData},
    Field<Labeled>{ContactKey::PhoneNumbers, &Contact::phoneNumbers},
    Field<Labeled>{ContactKey::EmailAddresses, &Contact::emailAddresses},
    Field<Labeled>{ContactKey::PostalAddresses, &Contact::postalAddresses},
    Field<Labeled>{ContactKey::Dates, &Contact::dates},
    Field<Labeled>{ContactKey::UrlAddresses, &Contact::urlAddresses},
    Field<Labeled>{ContactKey::Relations, &Contact::relations},
    Field<Labeled>{ContactKey::SocialProfiles, &Contact::socialProfiles},
    Field<Labeled>{ContactKey::InstantMessageAddresses, &Contact::instantMessageAddresses},
};
static_assert(std::tuple_size_v<decltype(kFields)> <= 32, "one bit per property");

/// Calls `f(field, bit)` for each property.
template <typename F>
void forEachField(F&& f) {
  std::apply([&](const auto&... field) {
    std::uint32_t bit = 1;
    ((f(field, bit), bit <<= 1), ...);
  }, kFields);
}

// Whether a contact holds a value that a projection without the property would not have.
bool held(ContactType type) { return type != ContactType::Person; }
bool held(const Text& text) { return text.has_value(); }
bool held(const ImageBytes& image) { return image != nullptr; }
bool held(const Labeled& values) { return !values.empty(); }

/// Known properties that vCards do not carry: nothing to keep, yet no unknown key.
bool isPropertyWithoutValue(std::string_view key) {
  using namespace ContactKey;
  return key == NonGregorianBirthday || key == ImageCropRect || key == PreferredLikenessSource ||
         key == PreferredPersonaIdentifier;
}

}  // namespace

ContactKeySet::ContactKeySet(ContactKeys keys) : keys_(std::move(keys)) {
  static std::atomic<std::uint64_t> made{0};
  id_ = ++made;
}

ContactProjection::ContactProjection(ContactKeys keys) : keys_(std::move(keys)) {
  for (const std::string& key : keys_) {
    std::uint32_t bits = 0;
    forEachField([&](const auto& field, std::uint32_t bit) {
      const bool named = !field.key.empty() && key == field.key;
      if (named || (field.formatter && key == ContactKey::FullNameFormatterKeys)) bits |= bit;
    });
    if (bits == 0 && !isPropertyWithoutValue(key)) unknownKey_ = key;
    kept_ |= bits;
  }
}

Contact ContactProjection::project(const Contact& contact) const {
  Contact out;
  out.identifier = contact.identifier;
  forEachField([&](const auto& field, std::uint32_t bit) {
    if ((kept_ & bit) != 0) out.*field.member = contact.*field.member;
  });
  return out;
}

std::shared_ptr<const Contact> ContactProjection::share(const std::shared_ptr<const Contact>& contact) const {
  std::uint32_t holds = 0;
  forEachField([&](const auto& field, std::uint32_t bit) {
    if (held((*contact).*field.member)) holds |= bit;
  });
  if ((holds & ~kept_) == 0) return contact;
  return std::make_shared<const Contact>(project(*contact));
}

Contact projectContact(const Contact& contact, const ContactKeys& keys, std::string* unknownKey) {
  const ContactProjection projection(keys);
  if (unknownKey != nullptr && !projection.unknownKey().empty()) *unknownKey = projection.unknownKey();
  return projection.project(contact);
}

std::optional<std::string> fullNameOfContact(const Contact& contact, std::string_view localeId) {
  if (present(contact.formattedName)) return contact.formattedName;
  const bool hasName = present(contact.givenName) || present(contact.middleName) || present(contact.familyName);
  if (contact.contactType == ContactType::Organization || !hasName) {
    if (present(contact.organizationName)) return contact.organizationName;
    if (!hasName) return std::nullopt;
  }
  std::string name;
  auto add = [&](const std::optional<std::string>& part, const char* separator) {
    if (!present(part)) return;
    if (!name.empty()) name += separator;
    name += *part;
  };
  if (familyNameFirst(localeId)) {
    // Written without spaces in Chinese and Japanese; with spaces in the others of the group.
    const std::string_view language = localeId.substr(0, 2);
    const char* separator = (language == "zh" || language == "ja") ? "" : " ";
    add(contact.familyName, separator);
    add(contact.middleName, separator);
    add(contact.givenName, separator);
  } else {
    add(contact.namePrefix, " ");
    add(contact.givenName, " ");
    add(contact.middleName, " ");
    add(contact.familyName, " ");
    add(contact.nameSuffix, " ");
  }
  if (name.empty()) return std::nullopt;
  return name;
}

bool contactMatchesName(const Contact& contact, std::string_view name, std::string_view localeId) {
  const std::string wanted = foldCase(name);
  if (wanted.empty()) return false;
  auto holds = [&](const std::optional<std::string>& text) {
    return text && foldCase(*text).find(wanted) != std::string::npos;
  };
  return holds(fullNameOfContact(contact, localeId)) || holds(contact.givenName) || holds(contact.familyName) ||
         holds(contact.nickname);
}

std::string assistantIdentifierForContactIdentifier(std::string_view contactIdentifier) {
  return std::string(kAssistantIdPrefix) + encodeToPercentEscape(contactIdentifier);
}

std::optional<std::string> contactIdentifierForAssistantIdentifier(std::string_view assistantIdentifier) {
  if (!assistantIdentifier.starts_with(kAssistantIdPrefix)) return std::nullopt;
  auto id = decodeFromPercentEscape(assistantIdentifier.substr(kAssistantIdPrefix.size()));
  if (!id || id->empty()) return std::nullopt;
  return id;
}

}  // namespace kyn::platform
