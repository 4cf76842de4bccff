#pragma once

#include "platform/assistant/Model.h"

#include <memory>

namespace kyn {

/// The account checks of a search and of a geofence, in their order: the service is offered here,
/// then (with the cached account dropped, so that it is read afresh) someone is signed in, the
/// account is provisioned for location sharing, and its token can be read. Nothing when all pass,
/// otherwise the failure of the first that does not.
[[nodiscard]] std::shared_ptr<AXCommandFailed> accountCheckFailure();

}  // namespace kyn
