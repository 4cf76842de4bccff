#pragma once

#include "commands/KYNBaseCmd.h"
#include "platform/address/PostalAddress.h"
#include "platform/assistant/Model.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn {

/// The request behind "tell me (or them) when a friend arrives at, leaves or is now at a place":
/// sets, changes or switches off one geofence about one friend. The answer is the fence as the
/// assistant knows it: its trigger, its place and the friend.
class SetGeoFenceCmd : public KYNBaseCmd {
 public:
  [[nodiscard]] std::string path() const override;
  /// "clientContext", then "emails", "requestedLocation", "label", "isOn", "address", "trigger",
  /// "onetimeonly", "fullAddress", "locationType" and "type"; logged whole.
  [[nodiscard]] Value jsonBodyDictionary() const override;

  /// The friend's handles (phones, then e-mail addresses); empty without a friend.
  [[nodiscard]] std::vector<std::string> allHandles() const;
  /// The server's location dictionary for the place; nothing when it has no usable coordinate.
  [[nodiscard]] std::optional<Value> requestedLocationDictionary() const;
  /// A postal address with the location's street, city, state, postal code and country.
  [[nodiscard]] static platform::PostalAddress postalAddressWithAXLocation(const std::shared_ptr<AXLocation>& location);
  /// The "fullAddress" object: the location's address fields (never its postal code) and the
  /// mailing-address text of this command's own place.
  [[nodiscard]] Value fullAddressDictionaryForAXLocation(const AXLocation& location) const;
  /// The place as a mailing address, by the conventions of its country; "" when it has no address.
  [[nodiscard]] std::string addressString() const;

  /// The fence for the assistant, made from any response (none included); never null. Sets
  /// `contextIdentifierURL`.
  [[nodiscard]] std::shared_ptr<AXKynGeoFence> result();

  [[nodiscard]] std::string_view commandName() const override { return "SetGeoFenceCmd"; }

  /// The place of the fence; a copy of what is given.
  [[nodiscard]] const std::shared_ptr<AXLocation>& location() const noexcept { return location_; }
  void setLocation(const std::shared_ptr<AXLocation>& location) {
    location_ = location ? std::make_shared<AXLocation>(*location) : nullptr;
  }

  // Properties.
  bool enable = false;       // the fence is on
  bool onetimeonly = false;  // it fires once only
  std::optional<std::string> trigger;    // one of the assistant's trigger values
  std::shared_ptr<AXPerson> axPerson;    // whom the fence is about; held, not copied
  std::optional<std::string> fenceType;  // the assistant's notify-me value, or another

 private:
  /// `fullAddressDictionaryForAXLocation` with the mailing-address text already made.
  [[nodiscard]] static Value fullAddressDictionary(const AXLocation& location, std::string addressText);

  std::shared_ptr<AXLocation> location_;
};

}  // namespace kyn
