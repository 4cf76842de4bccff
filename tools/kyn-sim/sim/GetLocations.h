#pragma once

#include "sim/DataSet.h"
#include "sim/Json.h"

#include <cstdint>
#include <stdexcept>

namespace kyn::sim {

/// A request body that breaks the protocol; its message goes back to the client with HTTP 400.
class BadRequest : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The value that answers carry under "serverContext"."authToken". Clients must not pass it on.
inline constexpr const char* kServerContextAuthToken = "sim-context-token";

/// Answers a get-locations request body from the data set, at `nowMs` (ms since 1970).
/// Throws BadRequest when the body is not a request object of the protocol.
[[nodiscard]] Json answerGetLocations(const DataSet& data, const Json& request, std::int64_t nowMs);

/// The "serverContext" of every answer: the data set's, the request's "clientId", the fake token.
[[nodiscard]] Json answerServerContext(const DataSet& data, const Json& request);

}  // namespace kyn::sim
