#include "handlers/KYNAXSearch.h"

#include "datasource/KYNAXDataSource.h"
#include "handlers/AccountChecks.h"
#include "platform/Services.h"

namespace kyn {

using platform::services;

namespace {

std::shared_ptr<AXCommandFailed> checkSearch(const KYNAXSearch& search) {
  // Only the last person counts, whatever the others hold.
  std::shared_ptr<AXPerson> last;
  if (search.friends && !search.friends->empty()) last = search.friends->back();
  const bool hasTarget = (last && last->emails && !last->emails->empty()) ||
                         (last && last->phones && !last->phones->empty()) || search.currentLocation ||
                         search.proximity;
  if (!hasTarget) return AXCommandFailed::commandFailedWithReason("Need at least emails or current location");
  return accountCheckFailure();
}

}  // namespace

std::shared_ptr<AXCommandFailed> KYNAXSearch::_validate() {
  auto failure = checkSearch(*this);
  if (failure) services().log().error("Validate returning status %@", failure);
  else services().log().notice("Validation successful.");
  return failure;
}

void KYNAXSearch::performWithCompletion(AXCompletion completion) {
  services().log().notice("search: %@", *this);
  if (auto failure = _validate()) {
    if (completion) completion(failure);
    return;
  }
  KYNAXDataSource::dataSource().search(*this, std::move(completion));
}

}  // namespace kyn
