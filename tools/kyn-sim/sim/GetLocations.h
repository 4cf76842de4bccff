#pragma once

#include "sim/DataSet.h"
#include "sim/Json.h"

#include <cstdint>
#include <optional>
#include <stdexcept>

namespace kyn::sim {

/// A request body that breaks the protocol; its message goes back to the client with HTTP 400.
class BadRequest : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The value that answers carry under "serverContext"."authToken". Clients must not pass it on.
inline constexpr const char* kServerContextAuthToken = "sim-context-token";

/// Answers a get-locations request body from what the account sees, at `nowMs` (ms since 1970).
/// Throws BadRequest when the body is not a request object of the protocol.
[[nodiscard]] Json answerGetLocations(const AccountView& view, const Json& request, std::int64_t nowMs);

/// The "serverContext" of every answer: the data set's, the request's "clientId", the fake token.
[[nodiscard]] Json answerServerContext(const Json& serverContext, const Json& request);

/// The location dictionary as answers send it, with the time of the fix at `nowMs`; null when
/// there is no location.
[[nodiscard]] Json locationAsSent(const Whereabouts& whereabouts, std::int64_t nowMs);

/// Checks what every request body shares: a JSON object with a "clientContext" object, and
/// optional members that are absent rather than null. Throws BadRequest.
void checkEnvelope(const Json& request);

/// The coordinate of the request's location dictionary under `key`; nothing when the member is
/// absent. Throws BadRequest when it is not an object with numeric "latitude" and "longitude".
[[nodiscard]] std::optional<Coordinate> requestCoordinate(const Json& request, const char* key);

}  // namespace kyn::sim
