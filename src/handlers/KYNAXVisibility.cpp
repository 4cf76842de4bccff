#include "handlers/KYNAXVisibility.h"

#include "account/Common.h"
#include "datasource/KYNAXDataSource.h"
#include "platform/Services.h"
#include "platform/sysinfo/LinuxSystemInfo.h"

namespace kyn {

using platform::services;

std::shared_ptr<AXCommandFailed> KYNAXVisibility::_validate() {
  auto& log = services().log();
  log.notice("KYNAXVisibility validate");
  const platform::AccountFileReadOnce readOnce;  // the checks see one version of the account
  Common& common = Common::sharedInstance();
  if (!common.isKYNAllowed()) return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceRestrictedInRegionErrorCode);
  if (common.isAppRestricted()) {
    // Checked before the account is dropped: a restricted user's cached account stays as it is.
    log.notice("App is restricted, cannot change visibility");
    return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceNotAvailableErrorCode);
  }
  log.notice("KYNAXVisibility clearing KYNAccount");
  common.clearKYNAccount();  // the checks below read the account anew: this command's one reading
  if (!common.hasKYNUser()) return AXCommandFailed::commandFailedWithErrorCode(AXKynNotLoggedInErrorCode);
  log.notice("KYNAXVisibility Checking provisionning");
  if (!services().session.get()->isProvisionedForLocationSharing()) {
    return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceRestrictedInAccountErrorCode);
  }
  log.notice("KYNAXVisibility Checking auth token");
  if (common.tokenIsNotAccessible()) return AXCommandFailed::commandFailedWithErrorCode(AXKynLockedErrorCode);
  return nullptr;
}

void KYNAXVisibility::performWithCompletion(AXCompletion completion) {
  auto failure = _validate();
  services().log().notice("KYNAXVisibility performWithCompletion %@", failure);
  if (failure) {
    if (completion) completion(failure);
    return;
  }
  KYNAXDataSource::dataSource().setVisibility(*this, std::move(completion));
}

}  // namespace kyn
