// The reply for a person to read, in the assistant's language.
#include "Host.h"

#include <cstdio>

namespace kyn::cli {
namespace {

std::string failureInWords(const Texts& texts, const Json& reply) {
  if (reply.contains("reason")) {
    // The plug-in's reasons are English; the one a user meets is said in the user's language.
    const std::string reason = reply.value("reason", std::string());
    return reason == Texts("en")[Text::NeedTarget] ? std::string(texts[Text::NeedTarget]) : reason;
  }
  const auto code = reply.value("errorCode", 0LL);
  constexpr long long kFirst = 1001;
  constexpr Text kByCode[] = {Text::NotLoggedIn,   Text::RestrictedInRegion, Text::RestrictedInAccount,
                              Text::Locked,        Text::NotAvailable,       Text::NotAFriend,
                              Text::NoFriends,     Text::GeoFenceNotCreated, Text::LabelNotFound,
                              Text::AddressNotFound};
  if (code >= kFirst && code < kFirst + static_cast<long long>(std::size(kByCode))) {
    return std::string(texts[kByCode[code - kFirst]]);
  }
  return texts.format(Text::FailedWithCode, std::to_string(code));
}

std::optional<Json> describe(Session& session, const Json& location) {
  const auto text = session.plugin.take(session.plugin.describeLocation(location.dump().c_str(), 1, nullptr));
  if (!text) return std::nullopt;
  Json value = Json::parse(*text, nullptr, false);
  return value.is_object() ? std::optional<Json>(value) : std::nullopt;
}

void printSearch(Session& session, const Json& command, const Json& reply, std::ostream& out) {
  const Texts& texts = session.texts;
  const Json locations = reply.value("kynLocations", Json::array());
  if (locations.empty()) out << texts[Text::NoLocations] << "\n";
  for (const auto& location : locations) {
    const Json described = describe(session, location).value_or(Json::object());
    std::string line = described.value("name", std::string(texts[Text::Unknown]));
    line += " — " + described.value("place", std::string("?"));
    if (location.contains("latitude") && location.contains("longitude")) {
      char coordinates[96];
      std::snprintf(coordinates, sizeof coordinates, " · %.5f, %.5f", location["latitude"].get<double>(),
                    location["longitude"].get<double>());
      line += coordinates;
    }
    if (described.contains("age")) line += " · " + described.value("age", std::string());
    if (location.contains("distance")) {
      char distance[48];
      std::snprintf(distance, sizeof distance, " · %.1f km away", location["distance"].get<double>() / 1000.0);
      line += distance;
    }
    out << line << "\n";
  }
  const auto* requested = command.contains("requestedLocation") ? &command["requestedLocation"] : nullptr;
  if (requested != nullptr && requested->is_object() && requested->contains("label") && reply.contains("atRequestedLocation")) {
    const std::string place = requested->value("label", std::string());
    out << texts.format(reply.value("atRequestedLocation", false) ? Text::AtPlaceYes : Text::AtPlaceNo, place) << "\n";
  }
}

}  // namespace

void printReply(Session& session, const Json& command, const Json& reply, std::ostream& out) {
  const std::string kind = reply.value("class", "");
  if (kind == "AXCommandFailed") {
    out << failureInWords(session.texts, reply) << "\n";
  } else if (kind == "AXKynSearchCompleted") {
    printSearch(session, command, reply, out);
  } else {
    out << reply.dump(2) << "\n";
  }
}

}  // namespace kyn::cli
