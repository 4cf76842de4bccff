#include "sim/GetLocations.h"

#include "sim/Geo.h"

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

namespace kyn::sim {

std::optional<Coordinate> requestCoordinate(const Json& request, const char* key) {
  const auto it = request.find(key);
  if (it == request.end()) return std::nullopt;
  if (!it->is_object()) throw BadRequest(std::string("\"") + key + "\" must be an object");
  const auto lat = it->find("latitude");
  const auto lon = it->find("longitude");
  if (lat == it->end() || !lat->is_number() || lon == it->end() || !lon->is_number()) {
    throw BadRequest(std::string("\"") + key + "\" needs numeric \"latitude\" and \"longitude\"");
  }
  return Coordinate{lat->get<double>(), lon->get<double>()};
}

namespace {

// The requested handles in order, each once; nothing when the request names none.
std::vector<std::string> requestedHandles(const Json& request) {
  std::vector<std::string> handles;
  const auto it = request.find("handles");
  if (it == request.end()) return handles;
  if (!it->is_array()) throw BadRequest("\"handles\" must be an array of strings");
  for (const auto& h : *it) {
    if (!h.is_string()) throw BadRequest("\"handles\" must be an array of strings");
    const auto& text = h.get_ref<const std::string&>();
    if (std::find(handles.begin(), handles.end(), text) == handles.end()) handles.push_back(text);
  }
  return handles;
}

// The data set's location with the time of the fix after the coordinate and accuracy.
Json locationWithTimestamp(const Json& location, std::optional<std::int64_t> timestampMs) {
  if (!timestampMs) return location;
  const char* after = location.contains("horizontalAccuracy") ? "horizontalAccuracy" : "longitude";
  Json out = Json::object();
  for (const auto& [key, value] : location.items()) {
    out[key] = value;
    if (key == after) out["timestamp"] = *timestampMs;
  }
  return out;
}

struct Query {
  std::optional<Coordinate> myLocation;
  std::optional<Coordinate> requestedLocation;
  double radius = 0.0;
  std::int64_t nowMs = 0;
};

Json friendEntry(const Friend& f, const Query& q) {
  Json entry = {{"status", 200}, {"match", false}};
  const Whereabouts& w = f.whereabouts;
  if (f.pending || !w.location) {
    entry["location"] = nullptr;
    return entry;
  }
  if (q.requestedLocation) entry["match"] = distanceInMeters(*w.coordinate, *q.requestedLocation) <= q.radius;
  if (q.myLocation) entry["distanceInMeters"] = distanceText(distanceInMeters(*w.coordinate, *q.myLocation));
  entry["location"] = locationAsSent(w, q.nowMs);
  return entry;
}

}  // namespace

Json locationAsSent(const Whereabouts& whereabouts, std::int64_t nowMs) {
  if (!whereabouts.location) return nullptr;
  std::optional<std::int64_t> timestamp = whereabouts.timestampMs;
  if (whereabouts.ageSeconds) timestamp = nowMs - *whereabouts.ageSeconds * 1000;
  return locationWithTimestamp(*whereabouts.location, timestamp);
}

void checkEnvelope(const Json& request) {
  if (!request.is_object()) throw BadRequest("the body must be a JSON object");
  if (!request.contains("clientContext") || !request["clientContext"].is_object()) {
    throw BadRequest("\"clientContext\" must be an object");
  }
  for (const auto& [key, value] : request.items()) {
    if (value.is_null()) throw BadRequest("\"" + key + "\" is null; leave optional members out instead");
  }
  if (request.contains("serverContext") && !request["serverContext"].is_object()) {
    throw BadRequest("\"serverContext\" must be an object");
  }
}

Json answerServerContext(const Json& serverContext, const Json& request) {
  Json context = serverContext;
  const auto sc = request.find("serverContext");
  if (sc != request.end() && sc->is_object() && sc->contains("clientId")) context["clientId"] = (*sc)["clientId"];
  context["authToken"] = kServerContextAuthToken;
  return context;
}

Json answerGetLocations(const AccountView& view, const Json& request, std::int64_t nowMs) {
  checkEnvelope(request);
  for (const char* key : {"label", "proximity"}) {
    if (request.contains(key) && !request[key].is_string()) {
      throw BadRequest(std::string("\"") + key + "\" must be a string");
    }
  }

  Query q;
  q.myLocation = requestCoordinate(request, "myLocation");
  q.requestedLocation = requestCoordinate(request, "requestedLocation");
  q.radius = proximityRadius(request.value("proximity", std::string()));
  q.nowMs = nowMs;
  const std::vector<std::string> handles = requestedHandles(request);

  Json answer = Json::object();
  answer["statusCode"] = 200;
  if (view.friends.empty()) {
    answer["statusCode"] = 417;
    answer["serverContext"] = answerServerContext(view.serverContext, request);
    return answer;
  }

  Json locations = Json::object();
  bool anyFriend = false;
  bool anyPending = false;
  if (handles.empty()) {
    for (const auto& f : view.friends) {
      locations[f.handle] = friendEntry(f, q);
      anyFriend = true;
      anyPending = anyPending || f.pending;
    }
  } else {
    for (const auto& h : handles) {
      const Friend* f = view.findFriend(h);
      // The entry is keyed by the handle as the client wrote it, so that it finds it again.
      locations[h] = f ? friendEntry(*f, q) : Json{{"status", 411}};
      anyFriend = anyFriend || f;
      anyPending = anyPending || (f && f->pending);
    }
  }
  if (!anyFriend) {
    answer["statusCode"] = 411;
  } else if (anyPending) {
    answer["statusCode"] = 416;
  }
  answer["locations"] = std::move(locations);
  // Without "emails" a client walks the keys of "locations", which is what answering all means.
  if (!handles.empty()) answer["emails"] = handles;
  answer["serverContext"] = answerServerContext(view.serverContext, request);
  return answer;
}

}  // namespace kyn::sim
