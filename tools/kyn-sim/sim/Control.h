#pragma once

#include "sim/Json.h"
#include "sim/World.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::sim {

/// The control paths steer the simulation; they are no part of the service and take the control
/// secret, not an account's token.
inline constexpr std::string_view kControlPathPrefix = "/kyn-sim/";
inline constexpr std::string_view kMovePath = "/kyn-sim/move";
/// The user name that goes with the control secret in HTTP Basic authorisation.
inline constexpr std::string_view kControlUser = "kyn-sim";

/// What a control client needs to reach the server: where, which CA to trust, and the secret.
struct ControlAccess {
  std::string host;  ///< an address or name the server certificate carries
  int port = 0;
  std::string caPem;
  std::string secret;
};

/// A host as it stands in a URL: an IPv6 literal in brackets.
[[nodiscard]] std::string urlHost(const std::string& host);
/// The control path's base URL, https://HOST:PORT.
[[nodiscard]] std::string controlUrl(const ControlAccess& access);

/// A fresh random secret (64 hexadecimal digits).
[[nodiscard]] std::string makeControlSecret();

/// The control file: a JSON object with "url", "ca" and "secret".
[[nodiscard]] std::string controlFileText(const ControlAccess& access);
/// Reads a control file; throws std::invalid_argument when it is not one.
[[nodiscard]] ControlAccess parseControlFile(std::string_view text);

/// Answers a move request body {"handle", "latitude", "longitude", "horizontalAccuracy"?} with
/// World::move's answer; nothing when nobody has the handle. Throws BadRequest.
[[nodiscard]] std::optional<Json> answerMove(World& world, const Json& request, std::int64_t nowMs);

/// The HTTP status and body of a control request, or why it could not be made.
struct ControlResult {
  int status = 0;  ///< 0 when no answer came
  std::string body;
  std::string error;
};

/// Posts `body` to a control path over HTTPS, trusting only the control file's CA.
[[nodiscard]] ControlResult postControl(const ControlAccess& access, std::string_view path, const Json& body);

}  // namespace kyn::sim
