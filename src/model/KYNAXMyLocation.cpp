#include "model/KYNAXMyLocation.h"

#include "account/Common.h"
#include "platform/Services.h"

namespace kyn {

std::optional<std::string> KYNAXMyLocation::handleFor(const std::optional<std::string>& preferredEmail) {
  if (preferredEmail) return preferredEmail;
  return Common::sharedInstance().username();
}

KYNAXMyLocation::KYNAXMyLocation(bool visible, platform::JsonView entry, const std::optional<std::string>& preferredEmail) {
  decodeHandle(handleFor(preferredEmail), nullptr, entry);
  isVisible = visible;
}

KYNAXMyLocation::KYNAXMyLocation(bool visible, std::shared_ptr<AXKynLocation> location,
                                 const std::optional<std::string>& preferredEmail) {
  decodeHandle(handleFor(preferredEmail), nullptr, platform::JsonView());
  isVisible = visible;
  if (location) avixLocation = std::move(location);
}

std::shared_ptr<KYNAXMyLocation> KYNAXMyLocation::myLocation(bool visible, std::shared_ptr<AXKynLocation> location,
                                                             const std::optional<std::string>& preferredEmail) {
  return std::make_shared<KYNAXMyLocation>(visible, std::move(location), preferredEmail);
}

std::shared_ptr<KYNAXMyLocation> KYNAXMyLocation::myLocation(bool visible, platform::JsonView entry,
                                                             const std::optional<std::string>& preferredEmail) {
  return std::make_shared<KYNAXMyLocation>(visible, entry, preferredEmail);
}

std::optional<std::string> KYNAXMyLocation::friendLocation(bool located) const {
  if (isVisible) return KYNAXLocation::friendLocation(located);
  return platform::avixUILocalizedStringForKey("HIDDEN_LOCATION");
}

std::string KYNAXMyLocation::description() const {
  return std::string("<KYNAXMyLocation visible=") + (isVisible ? "1 " : "0 ") +
         (avixLocation ? avixLocation->description() : std::string("(null)")) + ">";
}

}  // namespace kyn
