#pragma once

// A contact of the user's address book, the names of its properties, and the full-name formatter.

#include "platform/image/Image.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::platform {

/// Names of the contact properties that a fetch asks for.
namespace ContactKey {
/// Descriptor of every property that the full-name formatter reads.
inline constexpr std::string_view FullNameFormatterKeys = "fullNameFormatterKeys";
inline constexpr std::string_view NamePrefix = "namePrefix";
inline constexpr std::string_view GivenName = "givenName";
inline constexpr std::string_view MiddleName = "middleName";
inline constexpr std::string_view FamilyName = "familyName";
inline constexpr std::string_view PreviousFamilyName = "previousFamilyName";
inline constexpr std::string_view NameSuffix = "nameSuffix";
inline constexpr std::string_view Nickname = "nickname";
inline constexpr std::string_view PhoneticGivenName = "phoneticGivenName";
inline constexpr std::string_view PhoneticMiddleName = "phoneticMiddleName";
inline constexpr std::string_view PhoneticFamilyName = "phoneticFamilyName";
inline constexpr std::string_view OrganizationName = "organizationName";
inline constexpr std::string_view DepartmentName = "departmentName";
inline constexpr std::string_view JobTitle = "jobTitle";
inline constexpr std::string_view Birthday = "birthday";
inline constexpr std::string_view NonGregorianBirthday = "nonGregorianBirthday";
inline constexpr std::string_view Note = "note";
inline constexpr std::string_view ImageCropRect = "imageCropRect";
inline constexpr std::string_view ImageData = "imageData";
inline constexpr std::string_view ThumbnailImageData = "thumbnailImageData";
inline constexpr std::string_view PreferredLikenessSource = "preferredLikenessSource";
inline constexpr std::string_view PreferredPersonaIdentifier = "preferredPersonaIdentifier";
inline constexpr std::string_view ContactType = "contactType";
inline constexpr std::string_view PhoneNumbers = "phoneNumbers";
inline constexpr std::string_view EmailAddresses = "emailAddresses";
inline constexpr std::string_view PostalAddresses = "postalAddresses";
inline constexpr std::string_view Dates = "dates";
inline constexpr std::string_view UrlAddresses = "urlAddresses";
inline constexpr std::string_view Relations = "relations";
inline constexpr std::string_view SocialProfiles = "socialProfiles";
inline constexpr std::string_view InstantMessageAddresses = "instantMessageAddresses";
}  // namespace ContactKey

using ContactKeys = std::vector<std::string>;

/// A key list made once for many look-ups. Its keys never change, so a store that has read them
/// knows them again by the list's number, without comparing them.
class ContactKeySet {
 public:
  explicit ContactKeySet(ContactKeys keys);
  [[nodiscard]] const ContactKeys& keys() const noexcept { return keys_; }
  /// Unique among the sets of the process.
  [[nodiscard]] std::uint64_t id() const noexcept { return id_; }

 private:
  ContactKeys keys_;
  std::uint64_t id_;
};

enum class ContactType { Person, Organization };

/// One entry of a multi-valued property: a value and its label ("home", "work", "mobile", "fax",
/// or the card's own label text).
struct LabeledValue {
  std::optional<std::string> label;
  std::string value;
  bool operator==(const LabeledValue&) const = default;
};

/// A contact: one or more cards of the address book unified by their identifier. Text is UTF-8.
struct Contact {
  std::string identifier;
  ContactType contactType = ContactType::Person;

  std::optional<std::string> namePrefix;
  std::optional<std::string> givenName;
  std::optional<std::string> middleName;
  std::optional<std::string> familyName;
  std::optional<std::string> previousFamilyName;
  std::optional<std::string> nameSuffix;
  std::optional<std::string> nickname;
  std::optional<std::string> phoneticGivenName;
  std::optional<std::string> phoneticMiddleName;
  std::optional<std::string> phoneticFamilyName;
  std::optional<std::string> organizationName;
  std::optional<std::string> departmentName;
  std::optional<std::string> jobTitle;
  std::optional<std::string> birthday;
  std::optional<std::string> note;
  /// The card's own formatted name (vCard FN); read through the full-name formatter.
  std::optional<std::string> formattedName;

  /// The full picture, and a small one where the card carries one; shared, never copied.
  ImageBytes imageData;
  ImageBytes thumbnailImageData;

  std::vector<LabeledValue> phoneNumbers;
  std::vector<LabeledValue> emailAddresses;
  std::vector<LabeledValue> postalAddresses;
  std::vector<LabeledValue> dates;
  std::vector<LabeledValue> urlAddresses;
  std::vector<LabeledValue> relations;
  std::vector<LabeledValue> socialProfiles;
  std::vector<LabeledValue> instantMessageAddresses;
};

/// A key list read once: the properties that it keeps (the identifier always; the full-name
/// descriptor stands for every property the formatter reads). Projecting many contacts onto one
/// list then compares no keys, and a contact that holds nothing the list drops is shared, not copied.
class ContactProjection {
 public:
  explicit ContactProjection(ContactKeys keys);

  [[nodiscard]] const ContactKeys& keys() const noexcept { return keys_; }
  /// The last key that names no property; empty when every key names one.
  [[nodiscard]] const std::string& unknownKey() const noexcept { return unknownKey_; }

  /// A copy of `contact` holding only the kept properties.
  [[nodiscard]] Contact project(const Contact& contact) const;
  /// `contact` itself when it holds nothing that the keys drop, otherwise its projection.
  [[nodiscard]] std::shared_ptr<const Contact> share(const std::shared_ptr<const Contact>& contact) const;

 private:
  ContactKeys keys_;
  std::uint32_t kept_ = 0;
  std::string unknownKey_;
};

/// A copy of `contact` holding only the properties that `keys` name. A key that names no property
/// sets `*unknownKey` (when given) and is otherwise ignored.
[[nodiscard]] Contact projectContact(const Contact& contact, const ContactKeys& keys,
                                     std::string* unknownKey = nullptr);

/// The full name of a contact: the card's formatted name when it has one, otherwise its name parts
/// in the order that the locale writes them (family name first for Chinese, Japanese, Korean,
/// Hungarian, Vietnamese and Mongolian, given name first for the others), otherwise, for an
/// organisation or a contact without a name, the organisation name. Nothing when all are absent.
[[nodiscard]] std::optional<std::string> fullNameOfContact(const Contact& contact, std::string_view localeId);

/// True when the contact's full name (in `localeId`), given name, family name or nickname holds
/// `name`, compared ignoring case. An empty name matches nothing.
[[nodiscard]] bool contactMatchesName(const Contact& contact, std::string_view name, std::string_view localeId);

/// The assistant identifier (a URL) of a contact identifier, and back. The mapping is a bijection:
/// "x-kyn-contact:" followed by the percent-escaped contact identifier.
[[nodiscard]] std::string assistantIdentifierForContactIdentifier(std::string_view contactIdentifier);
[[nodiscard]] std::optional<std::string> contactIdentifierForAssistantIdentifier(std::string_view assistantIdentifier);

}  // namespace kyn::platform
