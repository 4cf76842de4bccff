#include "commands/ShowHideLocationCmd.h"

#include "platform/Services.h"
#include "platform/value/Json.h"
#include "utils/KYNAXUtils.h"

namespace kyn {

using platform::services;

std::string ShowHideLocationResult::description() const {
  return "(" + platform::toJson(response()) + ", " + (myLocation ? myLocation->description() : std::string("(null)")) + ")";
}

std::string ShowHideLocationCmd::path() const { return std::string(KYNUrlBase) + "showHideLocation"; }

std::optional<Value> ShowHideLocationCmd::currentLocationDictionary() const {
  return KYNAXUtils::dictionaryForLocation(currentLocation);
}

Value ShowHideLocationCmd::jsonBodyDictionary() const {
  Value body = KYNBaseCmd::jsonBodyDictionary();
  Value context = body["clientContext"];  // a copy: the shared context stays as it is
  if (auto here = currentLocationDictionary()) context["location"] = std::move(*here);
  body["clientContext"] = std::move(context);
  body["prefs"] = Value{{"hideLocation", hideLocation ? "Yes" : "No"}};
  return body;
}

std::shared_ptr<ShowHideLocationResult> ShowHideLocationCmd::result() {
  auto& log = services().log();
  const platform::JsonView response = jsonResponse();
  if (!response) return nullptr;
  auto out = std::make_shared<ShowHideLocationResult>();
  out->responseDocument = responseDocument();

  platform::JsonView myInfo = response.member("myInfo");
  if (!myInfo.isObject()) myInfo = {};
  const platform::JsonView preferredEmailValue = myInfo.member("preferredEmail");
  const auto preferredEmail = platform::stringValue(preferredEmailValue);
  takeServerContext(response,
                    preferredEmail ? std::optional<platform::JsonEntry>({"preferredEmail", preferredEmailValue}) : std::nullopt,
                    /*logged=*/true);
  if (log.isEnabled(platform::LogLevel::Default)) {
    log.notice("visibility_response: %@", "(" + platform::toJson(response) + ")");  // the record is not in yet
  }

  // The record shows what was asked for: once the exchange succeeded, the request is trusted.
  out->myLocation = KYNAXMyLocation::myLocation(!hideLocation, myInfo, preferredEmail);
  return out;
}

}  // namespace kyn
