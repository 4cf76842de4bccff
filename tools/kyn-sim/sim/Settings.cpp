#include "sim/Settings.h"

#include "sim/GetLocations.h"

#include <algorithm>
#include <string>

namespace kyn::sim {

namespace {

const Json* member(const Json& request, const char* key) {
  const auto it = request.find(key);
  return it == request.end() ? nullptr : &*it;
}

std::string text(const Json& request, const char* key, bool required) {
  const Json* value = member(request, key);
  if (!value) {
    if (required) throw BadRequest(std::string("\"") + key + "\" is missing");
    return {};
  }
  if (!value->is_string()) throw BadRequest(std::string("\"") + key + "\" must be a string");
  return value->get<std::string>();
}

// One of the protocol's words; the flags travel as the strings "true" and "false".
std::string oneOf(const Json& request, const char* key, std::initializer_list<const char*> words) {
  const std::string value = text(request, key, true);
  if (std::none_of(words.begin(), words.end(), [&](const char* w) { return value == w; })) {
    std::string known;
    for (const char* w : words) known += (known.empty() ? "\"" : ", \"") + std::string(w) + "\"";
    throw BadRequest(std::string("\"") + key + "\" must be one of " + known + ", not \"" + value + "\"");
  }
  return value;
}

}  // namespace

FenceRequest parseFenceRequest(const Json& request) {
  checkEnvelope(request);
  FenceRequest r;
  const Json* emails = member(request, "emails");
  if (!emails || !emails->is_array()) throw BadRequest("\"emails\" must be an array of handles");
  for (const auto& e : *emails) {
    if (!e.is_string()) throw BadRequest("\"emails\" must be an array of handles");
    r.emails.push_back(e.get<std::string>());
  }
  r.coordinate = requestCoordinate(request, "requestedLocation");
  if (r.coordinate) {
    const Json& location = request["requestedLocation"];
    if (location.contains("horizontalAccuracy") && location["horizontalAccuracy"].is_number()) {
      r.accuracy = location["horizontalAccuracy"].get<double>();
    }
  }
  r.label = text(request, "label", false);
  r.address = text(request, "address", false);
  if (const Json* full = member(request, "fullAddress")) {
    if (!full->is_object()) throw BadRequest("\"fullAddress\" must be an object");
    r.fullAddress = *full;
  }
  (void)text(request, "locationType", false);
  r.on = oneOf(request, "isOn", {"true", "false"}) == "true";
  r.trigger = oneOf(request, "trigger", {"enter", "exit", "immediate", ""});
  if (r.on && r.trigger.empty()) throw BadRequest("\"trigger\" must be \"enter\", \"exit\" or \"immediate\"");
  r.oneTimeOnly = oneOf(request, "onetimeonly", {"true", "false"}) == "true";
  r.notifyMe = oneOf(request, "type", {"NotifyMe", "NotifyOthers"}) == "NotifyMe";
  return r;
}

Json answerGeoFence(World& world, std::size_t account, const Json& request, std::int64_t nowMs) {
  const FenceRequest r = parseFenceRequest(request);
  FenceAnswer outcome = world.setFence(account, r, nowMs);
  Json answer = {{"statusCode", outcome.status}};
  if (!outcome.fence.is_null()) {
    answer["fence"] = std::move(outcome.fence);
    answer["fullAddress"] = std::move(outcome.fullAddress);
  }
  answer["serverContext"] = answerServerContext(world.serverContext(), request);
  return answer;
}

Json answerShowHideLocation(World& world, std::size_t account, const Json& request, std::int64_t nowMs) {
  checkEnvelope(request);
  const Json* prefs = member(request, "prefs");
  if (!prefs || !prefs->is_object()) throw BadRequest("\"prefs\" must be an object with \"hideLocation\"");
  const std::string hide = oneOf(*prefs, "hideLocation", {"Yes", "No"});
  Json answer = {{"statusCode", 200}, {"myInfo", world.setHidden(account, hide == "Yes", nowMs)}};
  answer["serverContext"] = answerServerContext(world.serverContext(), request);
  return answer;
}

}  // namespace kyn::sim
