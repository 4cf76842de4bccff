#include "platform/contacts/Contact.h"

#include "platform/text/StringEscapes.h"
#include "platform/text/Unicode.h"

#include <algorithm>
#include <array>

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

}  // namespace

Contact projectContact(const Contact& contact, const ContactKeys& keys, std::string* unknownKey) {
  Contact out;
  out.identifier = contact.identifier;
  for (const std::string& key : keys) {
    using namespace ContactKey;
    if (key == FullNameFormatterKeys) {
      out.contactType = contact.contactType;
      out.formattedName = contact.formattedName;
      out.namePrefix = contact.namePrefix;
      out.givenName = contact.givenName;
      out.middleName = contact.middleName;
      out.familyName = contact.familyName;
      out.nameSuffix = contact.nameSuffix;
      out.organizationName = contact.organizationName;
    } else if (key == NamePrefix) {
      out.namePrefix = contact.namePrefix;
    } else if (key == GivenName) {
      out.givenName = contact.givenName;
    } else if (key == MiddleName) {
      out.middleName = contact.middleName;
    } else if (key == FamilyName) {
      out.familyName = contact.familyName;
    } else if (key == PreviousFamilyName) {
      out.previousFamilyName = contact.previousFamilyName;
    } else if (key == NameSuffix) {
      out.nameSuffix = contact.nameSuffix;
    } else if (key == Nickname) {
      out.nickname = contact.nickname;
    } else if (key == PhoneticGivenName) {
      out.phoneticGivenName = contact.phoneticGivenName;
    } else if (key == PhoneticMiddleName) {
      out.phoneticMiddleName = contact.phoneticMiddleName;
    } else if (key == PhoneticFamilyName) {
      out.phoneticFamilyName = contact.phoneticFamilyName;
    } else if (key == OrganizationName) {
      out.organizationName = contact.organizationName;
    } else if (key == DepartmentName) {
      out.departmentName = contact.departmentName;
    } else if (key == JobTitle) {
      out.jobTitle = contact.jobTitle;
    } else if (key == Birthday) {
      out.birthday = contact.birthday;
    } else if (key == Note) {
      out.note = contact.note;
    } else if (key == ImageData) {
      out.imageData = contact.imageData;
    } else if (key == ThumbnailImageData) {
      out.thumbnailImageData = contact.thumbnailImageData;
    } else if (key == ContactKey::ContactType) {
      out.contactType = contact.contactType;
    } else if (key == PhoneNumbers) {
      out.phoneNumbers = contact.phoneNumbers;
    } else if (key == EmailAddresses) {
      out.emailAddresses = contact.emailAddresses;
    } else if (key == PostalAddresses) {
      out.postalAddresses = contact.postalAddresses;
    } else if (key == Dates) {
      out.dates = contact.dates;
    } else if (key == UrlAddresses) {
      out.urlAddresses = contact.urlAddresses;
    } else if (key == Relations) {
      out.relations = contact.relations;
    } else if (key == SocialProfiles) {
      out.socialProfiles = contact.socialProfiles;
    } else if (key == InstantMessageAddresses) {
      out.instantMessageAddresses = contact.instantMessageAddresses;
    } else if (key == NonGregorianBirthday || key == ImageCropRect || key == PreferredLikenessSource ||
               key == PreferredPersonaIdentifier) {
      // Known properties that vCards do not carry: nothing to copy.
    } else if (unknownKey != nullptr) {
      *unknownKey = key;
    }
  }
  return out;
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
