#include "handlers/KYNAXSetGeoFence.h"

#include "datasource/KYNAXDataSource.h"
#include "handlers/AccountChecks.h"
#include "platform/Services.h"

namespace kyn {

std::shared_ptr<AXCommandFailed> KYNAXSetGeoFence::_validate() {
  const bool hasTarget = (friend_ && friend_->emails && !friend_->emails->empty()) ||
                         (friend_ && friend_->phones && !friend_->phones->empty()) || requestedLocation;
  // The same words as a search's, although here the alternative is the place.
  if (!hasTarget) return AXCommandFailed::commandFailedWithReason("Need at least emails or current location");
  return accountCheckFailure();
}

void KYNAXSetGeoFence::performWithCompletion(AXCompletion completion) {
  platform::services().log().notice("search: %@", *this);
  if (auto failure = _validate()) {
    if (completion) completion(failure);
    return;
  }
  KYNAXDataSource::dataSource().setGeoFence(*this, std::move(completion));
}

}  // namespace kyn
