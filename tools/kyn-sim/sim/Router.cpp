#include "sim/Router.h"

#include "sim/Control.h"
#include "sim/Files.h"
#include "sim/GetLocations.h"
#include "sim/Settings.h"

#include <algorithm>
#include <cctype>
#include <random>

namespace kyn::sim {

namespace {

std::string lowercase(std::string_view text) {
  std::string out(text);
  for (auto& c : out) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return out;
}

Reply jsonReply(int status, const Json& body) {
  Reply r;
  r.status = status;
  r.body = body.dump(-1, ' ', false, Json::error_handler_t::replace);
  return r;
}

// Random bytes that no JSON parser accepts: the first byte can start no JSON text.
std::string garbage() {
  thread_local std::mt19937 random{std::random_device{}()};
  std::uniform_int_distribution<int> byte(0, 255);
  std::string out(512, '\0');
  for (auto& c : out) c = static_cast<char>(byte(random));
  out[0] = '\xff';
  return out;
}

// A request the endpoint refuses as malformed answers 400 with the reason.
template <class Answer>
Reply refusingBadRequests(Answer&& answer) {
  try {
    return answer();
  } catch (const BadRequest& e) {
    return errorReply(400, e.what());
  }
}

Reply redirectReply(std::string location, int status = 307) {
  Reply r;
  r.status = status;
  r.contentType = "text/plain";
  r.body = status == 301 ? "Moved Permanently\n" : "Temporary Redirect\n";
  r.headers.emplace_back("Location", std::move(location));
  return r;
}

}  // namespace

Reply errorReply(int status, std::string_view message) {
  return jsonReply(status, Json{{"statusCode", status}, {"error", message}});
}

std::string hostNameOf(std::string_view hostHeader) {
  if (!hostHeader.empty() && hostHeader.front() == '[') {
    const auto close = hostHeader.find(']');
    return lowercase(hostHeader.substr(1, close == std::string_view::npos ? std::string_view::npos : close - 1));
  }
  // One colon separates a port; more than one is a bare IPv6 address without brackets.
  const auto colon = hostHeader.find(':');
  if (colon != std::string_view::npos && hostHeader.find(':', colon + 1) == std::string_view::npos) {
    hostHeader = hostHeader.substr(0, colon);
  }
  return lowercase(hostHeader);
}

std::optional<std::string> redirectLocation(std::string_view hostHeader, std::string_view canonicalHost, int port,
                                            std::string_view target) {
  if (hostNameOf(hostHeader) == lowercase(canonicalHost)) return std::nullopt;
  const bool ipv6 = canonicalHost.find(':') != std::string_view::npos;
  std::string location = "https://";
  location += ipv6 ? "[" + std::string(canonicalHost) + "]" : std::string(canonicalHost);
  location += ":" + std::to_string(port);
  location += target.empty() ? "/" : target;
  return location;
}

std::optional<std::string> servicePath(std::string_view wordOrPath) {
  for (const std::string_view path : {kGetLocationsPath, kShowHideLocationPath, kGeoFencePath}) {
    if (wordOrPath == path || wordOrPath == path.substr(kServicePathPrefix.size())) return std::string(path);
  }
  return std::nullopt;
}

Router::Router(DataSet data, Authoriser authoriser, RouterOptions options, World::Sink notify)
    : world_(std::move(data), std::move(notify)), authoriser_(std::move(authoriser)), options_(std::move(options)) {
  addProtocolEndpoint(
      kGetLocationsPath,
      [this](std::size_t account, const Json& body, std::int64_t nowMs) {
        return answerGetLocations(world_.view(account), body, nowMs);
      },
      true);
  addProtocolEndpoint(
      kShowHideLocationPath,
      [this](std::size_t account, const Json& body, std::int64_t nowMs) {
        return answerShowHideLocation(world_, account, body, nowMs);
      },
      true);
  addProtocolEndpoint(
      kGeoFencePath,
      [this](std::size_t account, const Json& body, std::int64_t nowMs) {
        return answerGeoFence(world_, account, body, nowMs);
      },
      true);
  addEndpoint(
      std::string(kMovePath),
      [this](std::size_t, const Json& body, std::int64_t nowMs) {
        return refusingBadRequests([&] {
          auto moved = answerMove(world_, body, nowMs);
          if (!moved) return errorReply(404, "nobody in the data set has the handle " + body.value("handle", ""));
          Json answer = {{"statusCode", 200}};
          answer.update(*moved);
          return jsonReply(200, answer);
        });
      },
      false);
}

void Router::addEndpoint(std::string path, Endpoint endpoint, bool faultable) {
  routes_[std::move(path)] = Route{std::move(endpoint), faultable};
}

void Router::addProtocolEndpoint(std::string_view path,
                                 std::function<Json(std::size_t account, const Json& body, std::int64_t nowMs)> answer,
                                 bool faultable) {
  addEndpoint(
      std::string(path),
      [answer = std::move(answer)](std::size_t account, const Json& body, std::int64_t nowMs) {
        return refusingBadRequests([&] { return jsonReply(200, answer(account, body, nowMs)); });
      },
      faultable);
}

Router::FaultPlan Router::planFault() {
  const Fault& f = options_.fault;
  FaultPlan plan;
  if (f.kind == Fault::Kind::None) return plan;
  const long n = faultableRequests_.fetch_add(1);
  if (options_.faultCount && n >= *options_.faultCount) return plan;
  plan.name = f.describe();

  Reply& r = plan.replacement;
  switch (f.kind) {
    case Fault::Kind::None:
      return {};
    case Fault::Kind::Slow:
      plan.delay = f.delay;
      return plan;
    case Fault::Kind::Status:
      r = errorReply(f.status, "scripted fault");
      break;
    case Fault::Kind::Reset:
      r.delivery = Reply::Delivery::Reset;
      break;
    case Fault::Kind::Garbage:
      r.body = garbage();  // still labelled JSON: the client must not trust the label
      break;
    case Fault::Kind::Body:
      try {
        r.body = readFile(f.bodyPath);
      } catch (const std::exception& e) {
        r = errorReply(500, e.what());
      }
      break;
    case Fault::Kind::Truncate:
      plan.delivery = Reply::Delivery::Truncate;  // the real answer, cut short
      return plan;
    case Fault::Kind::Redirect:
      r = redirectReply(f.location, f.status);
      break;
  }
  plan.replaces = true;
  return plan;
}

Outcome Router::handle(const Call& call, std::int64_t nowMs) {
  Outcome out;
  // Control paths steer the simulator itself: no redirect, no fault, and the control secret.
  const bool control = call.path.rfind(kControlPathPrefix, 0) == 0;
  std::optional<std::size_t> account;
  if (control) {
    out.authorised = options_.control && options_.control->authorises(call.authorization);
    if (out.authorised) out.account = std::string(kControlUser);
  } else {
    account = authoriser_.account(call.authorization);
    out.authorised = account.has_value();
    if (account) out.account = world_.personId(*account);
  }

  if (options_.canonicalHost && !control) {
    if (auto location = redirectLocation(call.host, *options_.canonicalHost, port_, call.target)) {
      out.reply = redirectReply(std::move(*location));
      return out;
    }
  }
  if (!out.authorised) {
    out.reply = errorReply(401, "not authorised");
    out.reply.headers.emplace_back("WWW-Authenticate", "Basic realm=\"kyn-sim\"");
    return out;
  }
  const auto route = routes_.find(call.path);
  if (route == routes_.end()) {
    out.reply = errorReply(404, "no such endpoint");
    return out;
  }
  if (call.method != "POST") {
    out.reply = errorReply(405, "use POST");
    out.reply.headers.emplace_back("Allow", "POST");
    return out;
  }

  Json body;
  try {
    body = Json::parse(call.body);
  } catch (const Json::parse_error&) {
    out.reply = errorReply(400, "the body is not JSON");
    return out;
  }
  if (body.is_object() && body.contains("handles")) out.handles = body["handles"];

  const auto& paths = options_.faultPaths;
  const bool faulted = route->second.faultable &&
                       (paths.empty() || std::find(paths.begin(), paths.end(), call.path) != paths.end());
  FaultPlan plan = faulted ? planFault() : FaultPlan{};
  out.fault = std::move(plan.name);
  if (plan.replaces) {
    out.reply = std::move(plan.replacement);
    return out;
  }
  out.reply = route->second.endpoint(account.value_or(0), body, nowMs);
  out.reply.delay = plan.delay;
  out.reply.delivery = plan.delivery;
  return out;
}

}  // namespace kyn::sim
