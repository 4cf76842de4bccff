#pragma once

#include "sim/Auth.h"
#include "sim/DataSet.h"
#include "sim/Faults.h"
#include "sim/Json.h"
#include "sim/World.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kyn::sim {

/// Path prefix of every endpoint of the service.
inline constexpr std::string_view kServicePathPrefix = "/kytrservice/friends/va/";
inline constexpr std::string_view kGetLocationsPath = "/kytrservice/friends/va/getlocations";
inline constexpr std::string_view kShowHideLocationPath = "/kytrservice/friends/va/showHideLocation";
inline constexpr std::string_view kGeoFencePath = "/kytrservice/friends/va/geoFence";

/// The endpoint path for a command word ("geoFence") or a path of the service; nothing when the
/// service has no such endpoint.
[[nodiscard]] std::optional<std::string> servicePath(std::string_view wordOrPath);

/// An HTTP request, reduced to what the simulator decides on. Independent of the HTTP library.
struct Call {
  std::string method;
  std::string target;  ///< path and query as sent
  std::string path;
  std::string host;    ///< the Host header; empty when there was none
  std::optional<std::string> authorization;
  std::optional<std::string> apiVersion;   ///< "X-Zanto-Vorn-API-Ver"
  std::optional<std::string> authScheme;   ///< "X-Zanto-AuthScheme"
  std::string body;
};

/// What to send back, and how.
struct Reply {
  enum class Delivery {
    Normal,
    Reset,     ///< no answer: reset the connection
    Truncate,  ///< headers announce the whole body; only its first half is sent, then the connection drops
  };
  int status = 200;
  std::string contentType = "application/json";
  std::string body;
  std::vector<std::pair<std::string, std::string>> headers;
  Delivery delivery = Delivery::Normal;
  std::chrono::milliseconds delay{0};  ///< wait this long before answering
};

/// A decision together with the facts the request log records.
struct Outcome {
  Reply reply;
  bool authorised = false;
  std::optional<std::string> account;  ///< the person id signed in ("kyn-sim" on control paths)
  std::optional<Json> handles;  ///< the request's "handles" when the body had them
  std::string fault;            ///< the scripted fault that shaped the reply, if any
};

struct RouterOptions {
  std::optional<std::string> canonicalHost;  ///< redirect requests addressed to any other host
  Fault fault;
  std::optional<long> faultCount;  ///< apply the fault to this many requests; every request when unset
  std::vector<std::string> faultPaths;  ///< endpoints the fault shapes; every endpoint of the service when empty
  std::optional<Authoriser> control;    ///< who may use the control paths; nobody when unset
};

/// The host name of a Host header value: without the port, and without brackets for IPv6.
[[nodiscard]] std::string hostNameOf(std::string_view hostHeader);

/// Where to redirect a request, or nothing when it reached the canonical host already.
[[nodiscard]] std::optional<std::string> redirectLocation(std::string_view hostHeader, std::string_view canonicalHost,
                                                          int port, std::string_view target);

/// Turns calls into replies: redirect, authorisation, endpoint, scripted faults. Thread-safe.
class Router {
 public:
  /// An endpoint gets the number of the account signed in (0 on control paths), the parsed body
  /// and the time in ms since 1970.
  using Endpoint = std::function<Reply(std::size_t account, const Json& body, std::int64_t nowMs)>;

  /// `authoriser` numbers the accounts as the data set does; `notify` receives fence notifications.
  Router(DataSet data, Authoriser authoriser, RouterOptions options, World::Sink notify = {});
  Router(const Router&) = delete;  // endpoints refer back to the router
  Router& operator=(const Router&) = delete;

  /// The port that redirects name; known once the server is bound.
  void setPort(int port) { port_ = port; }

  [[nodiscard]] Outcome handle(const Call& call, std::int64_t nowMs);

  /// Adds a POST endpoint with a JSON body; `faultable` endpoints obey the scripted fault.
  void addEndpoint(std::string path, Endpoint endpoint, bool faultable);

  [[nodiscard]] World& world() noexcept { return world_; }

 private:
  struct Route {
    Endpoint endpoint;
    bool faultable = false;
  };

  // How the scripted fault shapes one request: a replacement answer, or a delay before the real one.
  struct FaultPlan {
    std::string name;
    bool replaces = false;
    Reply replacement;
    std::chrono::milliseconds delay{0};
    Reply::Delivery delivery = Reply::Delivery::Normal;
  };
  [[nodiscard]] FaultPlan planFault();
  void addProtocolEndpoint(std::string_view path,
                           std::function<Json(std::size_t account, const Json& body, std::int64_t nowMs)> answer,
                           bool faultable);

  World world_;
  Authoriser authoriser_;
  RouterOptions options_;
  std::atomic<int> port_{0};
  std::atomic<long> faultableRequests_{0};
  std::map<std::string, Route, std::less<>> routes_;
};

/// A JSON reply with {"statusCode": status, "error": message}.
[[nodiscard]] Reply errorReply(int status, std::string_view message);

}  // namespace kyn::sim
