#include "model/KYNAXLocation.h"

#include "account/Common.h"
#include "contacts/ContactsUtilities.h"
#include "platform/Services.h"
#include "platform/phone/PhoneNumbers.h"
#include "platform/text/Unicode.h"
#include "utils/KYNAXUtils.h"

#include <array>
#include <cmath>

namespace kyn {

using platform::services;

namespace {

/// The distance calculator's own preferences domain.
constexpr std::string_view kDistanceCalculatorSuiteName = "group.com.zanto.aerix.ky";

}  // namespace

KYNAXLocation::KYNAXLocation(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                             platform::JsonView entry) {
  decodeHandle(std::move(handle), std::move(person), entry);
}

KYNAXLocation::KYNAXLocation(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                             std::span<const platform::JsonView, kEntryKeys.size()> entryMembers) {
  decodeHandle(std::move(handle), std::move(person), entryMembers);
}

KYNAXLocation::KYNAXLocation(std::shared_ptr<AXKynLocation> location) : avixLocation(std::move(location)) {}

std::shared_ptr<KYNAXLocation> KYNAXLocation::locationWithHandle(const std::optional<std::string>& handle,
                                                                 std::shared_ptr<AXPerson> person, platform::JsonView entry) {
  return std::make_shared<KYNAXLocation>(handle, std::move(person), entry);
}

std::shared_ptr<KYNAXLocation> KYNAXLocation::locationWithAvixLocation(std::shared_ptr<AXKynLocation> location) {
  return std::make_shared<KYNAXLocation>(std::move(location));
}

std::shared_ptr<platform::NumberFormatting> KYNAXLocation::numberFormatter() {
  return services().numberFormatting.get();
}

std::shared_ptr<platform::Localization> KYNAXLocation::bundle() { return services().localization.get(); }

void KYNAXLocation::decodeHandle(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                                 platform::JsonView entry) {
  std::array<platform::JsonView, kEntryKeys.size()> entryMembers;
  entry.members(kEntryKeys, entryMembers);
  decodeHandle(std::move(handle), std::move(person), entryMembers);
}

void KYNAXLocation::decodeHandle(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                                 std::span<const platform::JsonView, kEntryKeys.size()> entryMembers) {
  auto location = std::make_shared<AXKynLocation>();
  avixLocation = location;

  if (!person) {
    const bool isEmail = handle && Common::sharedInstance().isHandleEmail(*handle);
    person = isEmail ? personForEmailFromContacts(handle) : personForPhoneFromContacts(handle);
  }
  services().log().notice("AXPerson found: %@", person);

  auto attribute = std::make_shared<AXPersonAttribute>();
  attribute->object = std::move(person);
  attribute->data = std::move(handle);
  location->friend_ = std::move(attribute);

  // Each object's members are read in one walk over it.
  if (const platform::JsonView distance = entryMembers[0]) {
    // The server sends the distance as text; it is read as the user's locale writes numbers.
    // A value that is no text reads as no distance.
    const auto written = distance.string();
    location->distance = written ? numberFormatter()->parseDecimal(*written) : std::nullopt;
  }

  // A location that is no JSON object (null included) is absent.
  const platform::JsonView fix = entryMembers[1].isObject() ? entryMembers[1] : platform::JsonView();
  enum { kAddress, kLatitude, kLongitude, kAccuracy, kTimestamp, kStreet, kLabels, kFixKeys };
  static constexpr std::array<std::string_view, kFixKeys> fixKeys{
      "address", "latitude", "longitude", "horizontalAccuracy", "timestamp", "streetAddress", "labels"};
  std::array<platform::JsonView, kFixKeys> fixed;
  fix.members(fixKeys, fixed);
  enum { kLocality, kStateCode, kAdministrativeArea, kAddressKeys };
  static constexpr std::array<std::string_view, kAddressKeys> addressKeys{"locality", "stateCode", "administrativeArea"};
  std::array<platform::JsonView, kAddressKeys> address;
  if (fixed[kAddress].isObject()) fixed[kAddress].members(addressKeys, address);

  platform::setStringValue(location->city, address[kLocality]);
  // The administrative area stands in only when the state code is missing altogether; a state
  // code that is present as null stays null.
  platform::setStringValue(location->stateCode, address[kStateCode] ? address[kStateCode] : address[kAdministrativeArea]);
  location->latitude = platform::numberValue(fixed[kLatitude]);
  location->longitude = platform::numberValue(fixed[kLongitude]);
  location->accuracy = platform::numberValue(fixed[kAccuracy]);
  location->locationDate = KYNAXUtils::timeIntervalForMillisecondsSince1970(platform::numberValue(fixed[kTimestamp]));
  platform::setStringValue(location->street, fixed[kStreet]);

  if (const platform::JsonView labels = fixed[kLabels]; labels.isArray()) {
    for (const auto& element : labels) {
      platform::setStringValue(location->label, element.value.member("label"));
      if (location->label) break;  // the first label that is there wins
    }
  }
}

bool KYNAXLocation::hasCoordinate() const {
  return avixLocation && avixLocation->latitude && avixLocation->longitude;
}

std::optional<std::string> KYNAXLocation::friendLocation(bool located) const {
  if (avixLocation && avixLocation->label) return avixLocation->label;
  std::optional<std::string> place;
  if (avixLocation) {
    const auto& state = avixLocation->stateCode;
    const auto& city = avixLocation->city;
    if (!state) {
      place = city;
    } else if (!city) {
      place = state;
    } else if (*city == *state) {
      place = city;
    } else {
      place = platform::format(platform::avixUILocalizedStringForKey("CITY_STATE_LABEL"), *city, *state);
    }
  }
  if (place) return place;
  return platform::avixUILocalizedStringForKey(located ? "NO_LOCATION" : "LOCATING");
}

// ---- Identity ----

std::shared_ptr<AXPerson> KYNAXLocation::personForEmailFromContacts(const std::optional<std::string>& email) const {
  auto person = std::make_shared<AXPerson>();
  auto entry = std::make_shared<AXEmail>();
  entry->emailAddress = email;
  person->emails = std::vector{entry};
  if (auto contact = ContactsUtilities::contactForEmail(email)) ContactsUtilities::fillPersonFromContact(*contact, *person);
  return person;
}

std::shared_ptr<AXPerson> KYNAXLocation::personForPhoneFromContacts(const std::optional<std::string>& phone) const {
  auto person = std::make_shared<AXPerson>();
  auto entry = std::make_shared<AXPhone>();
  entry->number = phone;
  person->phones = std::vector{entry};
  if (auto contact = ContactsUtilities::contactForPhone(phone)) ContactsUtilities::fillPersonFromContact(*contact, *person);
  return person;
}

std::shared_ptr<AXPerson> KYNAXLocation::friendPerson() const {
  if (!avixLocation || !avixLocation->friend_) return nullptr;
  return avixLocation->friend_->object;
}

std::optional<std::string> KYNAXLocation::friendEmail() const {
  const auto person = friendPerson();
  if (!person || !person->emails || person->emails->empty() || !person->emails->back()) return std::nullopt;
  return person->emails->back()->emailAddress;
}

std::optional<std::string> KYNAXLocation::friendPhone() const {
  const auto person = friendPerson();
  if (!person || !person->phones || person->phones->empty() || !person->phones->back()) return std::nullopt;
  return person->phones->back()->number;
}

std::optional<std::string> KYNAXLocation::friendName() const {
  const auto person = friendPerson();
  if (person && person->fullName && !person->fullName->empty()) return person->fullName;
  return friendHandlePretty();
}

std::optional<std::string> KYNAXLocation::friendHandle() const {
  if (auto email = friendEmail()) return email;
  return friendPhone();
}

std::optional<std::string> KYNAXLocation::friendHandlePretty() const {
  if (auto email = friendEmail()) return email;
  if (auto phone = friendPhone()) return formatPhoneNumber(*phone);
  return std::nullopt;
}

std::optional<std::string> KYNAXLocation::unformattedHandle() const {
  if (auto email = friendEmail()) return email;
  if (auto phone = friendPhone()) return unformatPhoneNumber(*phone);
  return std::nullopt;
}

bool KYNAXLocation::isPhone() const { return friendPhone() && !friendEmail(); }

std::string KYNAXLocation::formatPhoneNumber(const std::string& number) const {
  return platform::formatPhoneNumber(number, "", platform::PhoneNumberStyle::Display).value_or(number);
}

std::string KYNAXLocation::unformatPhoneNumber(const std::string& number) const {
  return platform::keepCodePoints(number, [](char32_t c) { return c == U'+' || platform::isDecimalDigit(c); });
}

// ---- Presentation ----

std::optional<std::string> KYNAXLocation::prettyTimestamp() const {
  const double date = avixLocation ? avixLocation->locationDate.value_or(0.0) : 0.0;
  if (date == 0.0 || !std::isfinite(date)) return std::nullopt;
  const auto formatter = services().dateFormatting.get();
  if (date > KYNAXUtils::todayAtMidnight()) return formatter->shortTime(date);
  if (date > KYNAXUtils::yesterdayAtMidnight()) return platform::avixUILocalizedStringForKey("DATE_YESTERDAY");
  return formatter->shortDateTime(date);
}

std::shared_ptr<platform::KYDistanceCalculator> KYNAXLocation::distanceCalculator() {
  // Made on first use, once for the process; the initialisation of a local static is thread-safe.
  static const std::shared_ptr<platform::KYDistanceCalculator> calculator = [] {
    auto& s = services();
    auto made = platform::KYDistanceCalculator::initWithDefaultsSuiteName(
        kDistanceCalculatorSuiteName, s.assistantPreferences.get()->languageCode(), s.locale.get()->localeId());
    made->setLocalizationDelegate(s.localization.get());
    return made;
  }();
  return calculator;
}

std::optional<std::string> KYNAXLocation::distanceFromLocation(const std::shared_ptr<const platform::Location>& location) const {
  if (!location || !avixLocation) return std::nullopt;
  auto friendAt = std::make_shared<AXLocation>();
  friendAt->latitude = avixLocation->latitude;
  friendAt->longitude = avixLocation->longitude;
  friendAt->accuracy = avixLocation->accuracy;
  const auto destination = KYNAXUtils::coreLocationForAXLocation(friendAt);
  if (!destination) return std::nullopt;
  const auto calculator = distanceCalculator();
  auto distance = calculator->localizedDistanceFromLocation(*location, *destination);
  services().log().notice("Distance calculated: %@ for friend: %@ (Unit:%li)", distance, friendName(),
                          calculator->measurementSystem());
  return distance;
}

std::shared_ptr<const platform::Image> KYNAXLocation::friendImage() {
  if (!cachedFriendImage) cachedFriendImage = friendImageForPersonAttribute(avixLocation ? avixLocation->friend_ : nullptr);
  return cachedFriendImage;
}

std::shared_ptr<const platform::Image> KYNAXLocation::friendImageForPersonAttribute(
    const std::shared_ptr<AXPersonAttribute>& attribute) {
  const std::shared_ptr<AXPerson> person = attribute ? attribute->object : nullptr;
  if (person) {
    if (auto image = ContactsUtilities::imageForContact(ContactsUtilities::contactForAssistantId(person->identifier))) {
      return image;
    }
  }
  return friendImageForAXPerson(person);
}

std::shared_ptr<const platform::Image> KYNAXLocation::friendImageForAXPerson(const std::shared_ptr<const AXObject>& object) {
  const auto person = std::dynamic_pointer_cast<const AXPerson>(object);
  if (!person) return nullptr;
  if (person->emails) {
    for (const auto& email : *person->emails) {
      if (!email) continue;
      if (auto image = ContactsUtilities::imageForContact(ContactsUtilities::contactForEmail(email->emailAddress))) return image;
    }
  }
  if (person->phones) {
    for (const auto& phone : *person->phones) {
      if (!phone) continue;
      if (auto image = ContactsUtilities::imageForContact(ContactsUtilities::contactForPhone(phone->number))) return image;
    }
  }
  return nullptr;
}

std::string KYNAXLocation::description() const {
  return "<KYNAXLocation " + (avixLocation ? avixLocation->description() : std::string("(null)")) + ">";
}

}  // namespace kyn
