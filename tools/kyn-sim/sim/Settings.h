#pragma once

#include "sim/Json.h"
#include "sim/World.h"

#include <cstdint>

namespace kyn::sim {

// The two requests that change what the service keeps for an account: its fences and whether its
// holder hides their location.

/// Decodes a set-geofence request body. Throws BadRequest when it breaks the protocol.
[[nodiscard]] FenceRequest parseFenceRequest(const Json& request);

/// Answers a set-geofence request of `account`: {"statusCode", "fence", "fullAddress",
/// "serverContext"}, the fence and its address only when one was set. Throws BadRequest.
[[nodiscard]] Json answerGeoFence(World& world, std::size_t account, const Json& request, std::int64_t nowMs);

/// Answers a show/hide-location request of `account`: {"statusCode", "myInfo", "serverContext"}.
/// Throws BadRequest unless "prefs" holds "hideLocation" "Yes" or "No".
[[nodiscard]] Json answerShowHideLocation(World& world, std::size_t account, const Json& request,
                                          std::int64_t nowMs);

}  // namespace kyn::sim
