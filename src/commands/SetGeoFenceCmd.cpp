#include "commands/SetGeoFenceCmd.h"

#include "account/Common.h"
#include "platform/Services.h"
#include "utils/KYNAXUtils.h"

namespace kyn {

using platform::member;
using platform::memberNotNull;
using platform::services;

namespace {

/// The server's word for the assistant's trigger; "" for anything it does not know.
std::string serverTrigger(const std::optional<std::string>& trigger) {
  if (trigger == AXKynGeoFenceTriggerOnArrivalValue) return "enter";
  if (trigger == AXKynGeoFenceTriggerOnDepartureValue) return "exit";
  if (trigger == AXKynGeoFenceTriggerImmediateValue) return "immediate";
  return "";
}

const char* flag(bool on) { return on ? "true" : "false"; }

}  // namespace

std::string SetGeoFenceCmd::path() const { return std::string(KYNUrlBase) + "geoFence"; }

std::vector<std::string> SetGeoFenceCmd::allHandles() const {
  if (!axPerson) return {};
  return Common::sharedInstance().handlesForAXPerson(*axPerson);
}

std::optional<Value> SetGeoFenceCmd::requestedLocationDictionary() const {
  const auto place = KYNAXUtils::coreLocationForAXLocation(location_);
  if (!place) return std::nullopt;
  return KYNAXUtils::dictionaryForLocation(place);
}

platform::PostalAddress SetGeoFenceCmd::postalAddressWithAXLocation(const std::shared_ptr<AXLocation>& location) {
  platform::PostalAddress address;
  if (!location) return address;
  address.street = location->street;
  address.city = location->city;
  address.state = location->stateCode;
  address.postalCode = location->postalCode;
  address.country = location->countryCode;
  return address;
}

std::string SetGeoFenceCmd::addressString() const {
  return services().postalAddressFormatter.get()->stringFromPostalAddress(postalAddressWithAXLocation(location_),
                                                                          platform::PostalAddressStyle::MailingAddress);
}

Value SetGeoFenceCmd::fullAddressDictionaryForAXLocation(const AXLocation& location) const {
  return fullAddressDictionary(location, addressString());
}

Value SetGeoFenceCmd::fullAddressDictionary(const AXLocation& location, std::string addressText) {
  Value address = Value::object();
  platform::reserveMembers(address, 6);
  auto add = [&](const char* key, const std::optional<std::string>& value) {
    if (value) address[key] = *value;
  };
  add("streetAddress", location.street);
  add("streetName", location.thoroughfare);
  add("locality", location.city);
  add("stateCode", location.stateCode);
  add("country", location.countryCode);
  // The postal code travels only inside the formatted line.
  address["formattedAddressLines"] = Value::array({std::move(addressText)});
  return address;
}

Value SetGeoFenceCmd::jsonBodyDictionary() const {
  Value body = KYNBaseCmd::jsonBodyDictionary();
  const std::string mappedTrigger = serverTrigger(trigger);
  body["emails"] = allHandles();
  if (auto place = requestedLocationDictionary()) body["requestedLocation"] = std::move(*place);
  if (location_ && location_->label) body["label"] = *location_->label;
  body["isOn"] = flag(enable);
  std::string address = addressString();  // made once, for both places that carry it
  body["address"] = address;
  body["trigger"] = mappedTrigger;
  body["onetimeonly"] = flag(onetimeonly);
  if (location_) {
    body["fullAddress"] = fullAddressDictionary(*location_, std::move(address));
    body["locationType"] = "4";  // always an address-kind place
  }
  body["type"] = fenceType == AXKynFenceTypeNotifyMeValue ? "NotifyMe" : "NotifyOthers";
  services().log().notice("requestDict: %@", body);
  return body;
}

std::shared_ptr<AXKynGeoFence> SetGeoFenceCmd::result() {
  const platform::JsonView response = jsonResponse();
  services().log().notice("setgeofence_resultDictionary_raw: %@", response);
  const platform::JsonView fence = response.memberNotNull("fence");
  const platform::JsonView fullAddress = response.memberNotNull("fullAddress");

  // The handle the server answered for, else the friend's last one.
  std::optional<std::string> handle;
  if (const platform::JsonView emails = fence.memberNotNull("emails"); emails.isArray()) {
    platform::JsonView last;
    for (const auto& item : emails) last = item.value;
    if (last) handle = platform::stringValue(last);
  }
  if (!handle || handle->empty()) {
    auto handles = allHandles();
    handle = handles.empty() ? std::nullopt : std::optional(std::move(handles.back()));
  }

  takeServerContext(response, std::nullopt, /*logged=*/false);

  auto geoFence = std::make_shared<AXKynGeoFence>();
  geoFence->trigger = trigger;
  geoFence->friend_ = std::make_shared<AXPersonAttribute>();
  geoFence->friend_->object = axPerson;
  geoFence->friend_->data = handle;

  // A fence switched off comes back without a place: the place is the one this request named.
  platform::JsonView coordinates = fence;
  platform::JsonView address = fullAddress;
  Value body;
  if (!enable && !fence && !fullAddress && platform::int32Value(statusCodeValue()) == 221) {
    body = jsonBodyDictionary();
    coordinates = memberNotNull(&body, "requestedLocation");
    address = memberNotNull(&body, "fullAddress");
  }

  auto place = std::make_shared<AXLocation>();
  place->latitude = platform::numberValue(coordinates.member("latitude"));
  place->longitude = platform::numberValue(coordinates.member("longitude"));
  place->accuracy = 0.0;
  place->label = location_ ? location_->label : std::nullopt;
  place->street = platform::stringValue(address.member("streetAddress"));
  geoFence->location = std::move(place);
  return geoFence;
}

}  // namespace kyn
