#include "datasource/KYNAXDataSource.h"

#include "account/Common.h"
#include "commands/GetLocationsCmd.h"
#include "commands/SetGeoFenceCmd.h"
#include "commands/ShowHideLocationCmd.h"
#include "datasource/ReplyCallback.h"
#include "platform/Services.h"
#include "platform/resources/Resources.h"
#include "utils/KYNAXUtils.h"

namespace kyn {

using platform::services;

KYNAXDataSource& KYNAXDataSource::dataSource() {
  static KYNAXDataSource instance;
  return instance;
}

KYNAXDataSource::KYNAXDataSource() {
  // The account context must outlive the data source, whose destructor completes what is in flight.
  (void)Common::sharedInstance();
  controller_ = platform::makeServerInteractionController(services().configuration()->transport());
}

std::shared_ptr<platform::KYServerInteractionController> KYNAXDataSource::serverInteractionController() const {
  std::lock_guard lock(mutex_);
  return controller_;
}

void KYNAXDataSource::setServerInteractionController(std::shared_ptr<platform::KYServerInteractionController> controller) {
  std::shared_ptr<platform::KYServerInteractionController> previous;
  {
    std::lock_guard lock(mutex_);
    previous = std::exchange(controller_, std::move(controller));
  }
  // `previous` goes here, outside the lock: its destructor may complete commands in flight.
}

namespace {

/// The reply to a finished search: 417 and 411 in the body are failures, every other body status a
/// completed search; a failed transfer is "not logged in" for HTTP 401 and "not available" otherwise.
std::shared_ptr<AXObject> searchReply(GetLocationsCmd& command) {
  auto& log = services().log();
  // Reading the result parses the response and so fills the status code: it comes first.
  auto locations = command.result();
  // The same records that result() has just logged: the same text, made once.
  if (auto described = command.takeResultDescription(); described && locations) log.notice("Result: %@", *described);
  else log.notice("Result: %@", locations);
  if (command.wasSuccessful()) {
    const std::int32_t status = platform::int32Value(command.statusCodeValue());
    if (status == 417) return AXCommandFailed::commandFailedWithErrorCode(AXKynNoFriendsErrorCode);
    if (status == 411) return AXCommandFailed::commandFailedWithErrorCode(AXKynNotAFriendErrorCode);
    auto completed = AXKynSearchCompleted::searchCompleted();
    completed->kynLocations = std::move(locations);
    completed->atRequestedLocation = command.atRequestedLocation;
    completed->searchContext = command.contextIdentifierURL();
    return completed;
  }
  const std::int64_t http = command.response() ? command.response()->statusCode : 0;
  log.notice("ERROR: Server HTTP Status: %ld", http);
  const std::int64_t code = http == 401 ? AXKynNotLoggedInErrorCode : AXKynServiceNotAvailableErrorCode;
  log.notice("Error code response: %ld", code);
  return AXCommandFailed::commandFailedWithErrorCode(code);
}

}  // namespace

void KYNAXDataSource::search(const AXKynSearch& command, AXCompletion completion) {
  auto request = std::make_shared<GetLocationsCmd>();
  request->currentLocation = KYNAXUtils::coreLocationForAXLocation(command.currentLocation);
  request->requestedLocation = KYNAXUtils::coreLocationForAXLocation(command.requestedLocation);
  request->requestedLocationLabel = command.requestedLocation ? command.requestedLocation->label : std::nullopt;
  request->friends = command.friends;
  request->proximity = command.proximity;

  send(request, replyCallback(request, std::move(completion), &searchReply));
}

namespace {

/// The reply to a finished show/hide request: completed for any positive body status after a
/// successful transfer; "not available" for every other outcome, an HTTP 401 and a body that does
/// not parse included.
std::shared_ptr<AXObject> visibilityReply(ShowHideLocationCmd& command) {
  auto& log = services().log();
  if (command.wasSuccessful()) {
    // The result exists only for a parsed response; reading it also fills the status code.
    const auto result = command.result();
    log.notice("Result: %@", result);
    const std::int32_t status = platform::int32Value(command.statusCodeValue());
    if (result && status > 0) {
      auto completed = AXKynVisibilitySetCompleted::visibilitySetCompleted();
      completed->searchContext = command.contextIdentifierURL();
      return completed;
    }
    return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceNotAvailableErrorCode);
  }
  log.notice("ERROR: Server HTTP Status: %ld", command.response() ? command.response()->statusCode : 0);
  return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceNotAvailableErrorCode);
}

}  // namespace

void KYNAXDataSource::setVisibility(const AXKynVisibilityStateSet& command, AXCompletion completion) {
  auto request = std::make_shared<ShowHideLocationCmd>();
  request->hideLocation = !command.visible.value_or(false);
  services().log().notice("KYNAXDataSource: SetVisibility with completion");
  send(request, replyCallback(request, std::move(completion), &visibilityReply));
}

void KYNAXDataSource::send(const std::shared_ptr<platform::KYJSONCommand>& request, std::function<void()> callback) {
  auto controller = serverInteractionController();
  if (!controller) {
    // Only a C++ host that took the controller away gets here: answer rather than leave it waiting.
    request->setCompletionBlock(callback);
    callback();
    return;
  }
  controller->sendCommand(request, std::move(callback));
}

namespace {

/// The reply to a finished geofence request. The body's status code alone decides, whatever became
/// of the transfer: each failure code has its error, 200 to 299 is the fence set, anything else
/// "not available".
std::shared_ptr<AXObject> geoFenceReply(SetGeoFenceCmd& command) {
  auto& log = services().log();
  // Reading the result parses the response and so fills the status code: it comes first.
  auto fence = command.result();
  const std::int64_t status = platform::integerValue(command.statusCodeValue());
  log.notice("Server HTTP Status: %ld", status);
  log.notice("GeoFenceResult: %@", fence);
  const auto failed = [](std::int64_t code) { return AXCommandFailed::commandFailedWithErrorCode(code); };
  if (status == 411) return failed(AXKynNotAFriendErrorCode);
  if (status == 417) return failed(AXKynNoFriendsErrorCode);
  if (status == 500) return failed(AXKynGeoFenceNotCreatedErrorCode);
  if (status == 521) return failed(AXKynLabelNotFoundErrorCode);
  if (status >= 541 && status <= 544) return failed(AXKynGeoFenceNotCreatedErrorCode);
  if (status == 401) return failed(AXKynNotLoggedInErrorCode);
  if (status == 535) return failed(AXKynAddressNotFoundErrorCode);
  if (status < 200 || status > 299) return failed(AXKynServiceNotAvailableErrorCode);
  auto completed = AXKynGeoFenceSetCompleted::geoFenceSetCompleted();
  completed->searchContext = command.contextIdentifierURL();
  completed->geoFence = std::move(fence);
  return completed;
}

}  // namespace

void KYNAXDataSource::setGeoFence(const AXKynGeoFenceSet& command, AXCompletion completion) {
  auto request = std::make_shared<SetGeoFenceCmd>();
  request->axPerson = command.friend_;
  request->setLocation(command.requestedLocation);  // as the assistant gave it: the address is read from it
  request->trigger = command.geoFenceTrigger;
  request->onetimeonly = command.oneTimeOnly.value_or(false);
  request->fenceType = command.fenceType;
  request->enable = command.enable.value_or(false);

  send(request, replyCallback(request, std::move(completion), &geoFenceReply));
}

void KYNAXDataSource::loadMockLocationData() {
  if (mockLocations_) return;
  mockLocations_ = platform::readResourceDictionary("MockLocations");
}

void KYNAXDataSource::dataLoaded(const Value& object) { services().log().notice("dataLoaded: %@", object); }

}  // namespace kyn
