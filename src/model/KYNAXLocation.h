#pragma once

#include "model/KYNAXBaseModel.h"
#include "platform/assistant/Model.h"
#include "platform/image/Image.h"
#include "platform/localization/Localization.h"
#include "platform/location/DistanceCalculator.h"
#include "platform/location/Location.h"
#include "platform/value/Value.h"

#include <array>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace kyn {

/// One friend's whereabouts: an assistant location filled from the server's friend location entry,
/// with the friend's identity from the user's contacts and the texts that describe the place.
class KYNAXLocation : public KYNAXBaseModel {
 public:
  /// Decodes `entry` (a friend location entry, or nothing) for `handle`; without a person, one is
  /// built from the contacts.
  KYNAXLocation(std::optional<std::string> handle, std::shared_ptr<AXPerson> person, platform::JsonView entry);
  /// The members of a friend location entry that decoding reads, in the order in which the
  /// constructor below takes their values: for a caller that reads other members of the entry in
  /// the same walk over it.
  static constexpr std::array<std::string_view, 2> kEntryKeys{"distanceInMeters", "location"};
  /// Decodes an entry from its members named by `kEntryKeys`, found by the caller.
  KYNAXLocation(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                std::span<const platform::JsonView, kEntryKeys.size()> entryMembers);
  /// Wraps an assistant location as it is: nothing decoded, no person looked up.
  explicit KYNAXLocation(std::shared_ptr<AXKynLocation> avixLocation);
  ~KYNAXLocation() override = default;

  [[nodiscard]] static std::shared_ptr<KYNAXLocation> locationWithHandle(const std::optional<std::string>& handle,
                                                                         std::shared_ptr<AXPerson> person,
                                                                         platform::JsonView entry);
  [[nodiscard]] static std::shared_ptr<KYNAXLocation> locationWithAvixLocation(std::shared_ptr<AXKynLocation> location);

  /// Replaces `avixLocation` with one decoded from `entry`. Values of the wrong type read as absent.
  void decodeHandle(std::optional<std::string> handle, std::shared_ptr<AXPerson> person, platform::JsonView entry);
  /// The same from the entry's members named by `kEntryKeys`.
  void decodeHandle(std::optional<std::string> handle, std::shared_ptr<AXPerson> person,
                    std::span<const platform::JsonView, kEntryKeys.size()> entryMembers);

  /// Latitude and longitude are both present (zero counts as present).
  [[nodiscard]] bool hasCoordinate() const;
  /// The short place text: the label, else city and state, else "LOCATING" (`located` false) or
  /// "NO_LOCATION" (`located` true), localised.
  [[nodiscard]] virtual std::optional<std::string> friendLocation(bool located) const;
  /// The shared decimal formatter of the user's current locale.
  [[nodiscard]] static std::shared_ptr<platform::NumberFormatting> numberFormatter();
  /// The plug-in's string tables.
  [[nodiscard]] static std::shared_ptr<platform::Localization> bundle();

  // ---- Identity ----

  /// A person for an e-mail handle: the handle as its one e-mail entry, names and identifier from
  /// the matching contact when there is one.
  [[nodiscard]] std::shared_ptr<AXPerson> personForEmailFromContacts(const std::optional<std::string>& email) const;
  /// The same for a phone handle.
  [[nodiscard]] std::shared_ptr<AXPerson> personForPhoneFromContacts(const std::optional<std::string>& phone) const;

  /// The full name, or the pretty handle when the name is absent or empty.
  [[nodiscard]] std::optional<std::string> friendName() const;
  /// The address of the friend's last e-mail entry.
  [[nodiscard]] std::optional<std::string> friendEmail() const;
  /// The number of the friend's last phone entry.
  [[nodiscard]] std::optional<std::string> friendPhone() const;
  /// The e-mail address, else the phone number.
  [[nodiscard]] std::optional<std::string> friendHandle() const;
  /// The e-mail address, else the phone number formatted for display.
  [[nodiscard]] std::optional<std::string> friendHandlePretty() const;
  /// The e-mail address, else the phone number reduced to digits and "+".
  [[nodiscard]] std::optional<std::string> unformattedHandle() const;
  /// A phone number and no e-mail address.
  [[nodiscard]] bool isPhone() const;

  /// The number in the international display format; unchanged when it cannot be read.
  [[nodiscard]] std::string formatPhoneNumber(const std::string& number) const;
  /// Only the decimal digits (of any script) and "+", in order.
  [[nodiscard]] std::string unformatPhoneNumber(const std::string& number) const;

  // ---- Presentation ----

  /// When the friend was located: the time alone after today's midnight, the localised
  /// "DATE_YESTERDAY" after yesterday's, else the date and time. Nothing without a date (or with a
  /// date of exactly 0). Exactly today's midnight reads as yesterday, exactly yesterday's as a date.
  [[nodiscard]] virtual std::optional<std::string> prettyTimestamp() const;
  /// How far the friend is from `location`, in the user's words and units; nothing without either
  /// location or without a coordinate of the friend.
  [[nodiscard]] std::optional<std::string> distanceFromLocation(const std::shared_ptr<const platform::Location>& location) const;
  /// The process's one distance calculator: words in the assistant's language, units of the
  /// system locale's region.
  [[nodiscard]] static std::shared_ptr<platform::KYDistanceCalculator> distanceCalculator();
  /// The friend's full contact picture, looked up once found (not again after a find).
  [[nodiscard]] std::shared_ptr<const platform::Image> friendImage();
  /// The picture of the contact behind the person's identifier, else `friendImageForAXPerson`.
  [[nodiscard]] static std::shared_ptr<const platform::Image> friendImageForPersonAttribute(
      const std::shared_ptr<AXPersonAttribute>& attribute);
  /// The first picture among the contacts of the person's e-mail addresses, then of its phone
  /// numbers, in order; nothing for an object that is not a person.
  [[nodiscard]] static std::shared_ptr<const platform::Image> friendImageForAXPerson(const std::shared_ptr<const AXObject>& object);

  [[nodiscard]] std::string description() const override;

  std::shared_ptr<AXKynLocation> avixLocation;
  std::shared_ptr<const platform::Image> cachedFriendImage;

 protected:
  /// A record with nothing decoded yet, for subclasses that decode themselves.
  KYNAXLocation() = default;
  [[nodiscard]] std::shared_ptr<AXPerson> friendPerson() const;
};

}  // namespace kyn
