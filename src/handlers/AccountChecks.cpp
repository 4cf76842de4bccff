#include "handlers/AccountChecks.h"

#include "account/Common.h"
#include "platform/Services.h"
#include "platform/sysinfo/LinuxSystemInfo.h"

namespace kyn {

std::shared_ptr<AXCommandFailed> accountCheckFailure() {
  const platform::AccountFileReadOnce readOnce;  // the checks see one version of the account
  Common& common = Common::sharedInstance();
  if (!common.isKYNAllowed()) return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceRestrictedInRegionErrorCode);
  common.clearKYNAccount();  // the checks below read the account anew: this command's one reading
  if (!common.hasKYNUser()) return AXCommandFailed::commandFailedWithErrorCode(AXKynNotLoggedInErrorCode);
  if (!platform::services().session.get()->isProvisionedForLocationSharing()) {
    return AXCommandFailed::commandFailedWithErrorCode(AXKynServiceRestrictedInAccountErrorCode);
  }
  if (common.tokenIsNotAccessible()) return AXCommandFailed::commandFailedWithErrorCode(AXKynLockedErrorCode);
  return nullptr;
}

}  // namespace kyn
