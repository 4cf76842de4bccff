// `notify`: "tell me when Ada arrives at work" as the assistant's geofence command, and its reply in
// words.
#include "Commands.h"

#include <cctype>
#include <cstdio>
#include <sstream>
#include <vector>

namespace kyn::cli {
namespace {

// The assistant's values of the trigger and the fence type.
constexpr const char* kOnArrival = "OnArrival";
constexpr const char* kOnDeparture = "OnDeparture";
constexpr const char* kImmediate = "Immediate";
constexpr const char* kNotifyMe = "Me";
constexpr const char* kNotifyOthers = "Others";

std::string trimmed(const std::string& text) {
  const auto first = text.find_first_not_of(" \t");
  if (first == std::string::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

bool hasDigit(const std::string& text) {
  for (const unsigned char c : text) {
    if (std::isdigit(c)) return true;
  }
  return false;
}

/// The text member `key` of `object`, or "".
std::string textOf(const Json& object, const char* key) {
  if (!object.is_object()) return {};
  const auto it = object.find(key);
  return it != object.end() && it->is_string() ? it->get<std::string>() : std::string();
}

const Json& memberOf(const Json& object, const char* key) {
  static const Json none;
  if (!object.is_object()) return none;
  const auto it = object.find(key);
  return it == object.end() ? none : *it;
}

/// Who the fence is about: the name the reply (or the command) gives the friend, else a handle.
std::string friendName(const Texts& texts, const Json& command, const Json& fence) {
  const Json& attribute = memberOf(fence, "friend");
  for (const Json* person : {&memberOf(attribute, "object"), &memberOf(command, "friend")}) {
    if (auto name = textOf(*person, "fullName"); !name.empty()) return name;
  }
  if (auto handle = textOf(attribute, "data"); !handle.empty()) return handle;
  const Json& person = memberOf(command, "friend");
  for (const auto& [list, key] : {std::pair{"emails", "emailAddress"}, std::pair{"phones", "number"}}) {
    const Json& entries = memberOf(person, list);
    if (entries.is_array() && !entries.empty()) {
      if (auto handle = textOf(entries.front(), key); !handle.empty()) return handle;
    }
  }
  return std::string(texts[Text::Unknown]);
}

/// Where: the place's label, else its street (the server's, then the user's), else its coordinate.
std::string placeName(const Json& command, const Json& fence) {
  const Json& answered = memberOf(fence, "location");
  const Json& asked = memberOf(command, "requestedLocation");
  for (const Json* location : {&answered, &asked}) {
    if (auto label = textOf(*location, "label"); !label.empty()) return label;
  }
  for (const Json* location : {&answered, &asked}) {
    if (auto street = textOf(*location, "street"); !street.empty()) return street;
  }
  if (auto city = textOf(asked, "city"); !city.empty()) return city;
  for (const Json* location : {&answered, &asked}) {
    const Json& lat = memberOf(*location, "latitude");
    const Json& lon = memberOf(*location, "longitude");
    if (lat.is_number() && lon.is_number()) {
      char text[64];
      std::snprintf(text, sizeof text, "%.5f, %.5f", lat.get<double>(), lon.get<double>());
      return text;
    }
  }
  return "?";
}

}  // namespace

NotifyCommand::NotifyCommand(CLI::App& app)
    : sub_(app.add_subcommand("notify",
                              "Tell me when a friend arrives at, leaves or is at a place (or tell the friend when I "
                              "do). Sets, changes or switches off the notification.")) {
  sub_->add_option("-f,--friend", friend_,
                   "The friend: an e-mail address, a phone number, or a name from your contacts")
      ->required();
  auto* when = sub_->add_option_group("when", "When the notification comes (one of them)");
  when->add_flag("--arrives", arrives_, "When the friend arrives at the place");
  when->add_flag("--leaves", leaves_, "When the friend leaves the place");
  when->add_flag("--now", now_, "As soon as the friend is at the place: now, or at the next arrival (once only)");
  when->require_option(1);
  auto* where = sub_->add_option_group("where", "The place (one of them)");
  auto* place =
      where->add_option("--place", place_, "The name of the place (\"Work\"): one of your places, or a new one");
  where->add_option("--address", address_,
                    "The place's address: \"street, city[, state][, postal code][, country code]\"; leave a part "
                    "empty to skip it (\"Beispielstraße 5, Berlin, , DE\")");
  where->require_option(1);
  sub_->add_option("--place-at", placeAt_, "Where the named place is: LAT,LON")->needs(place);
  sub_->add_flag("--once", once_, "Only the first time, then the notification switches itself off");
  sub_->add_flag("--them", them_, "Tell the friend when I arrive or leave, instead of telling me about the friend");
  sub_->add_flag("--off", off_, "Switch the notification off");
}

Json NotifyCommand::build(Session& session) {
  Json location = namedPlace(session, place_, placeAt_);
  if (!address_.empty()) {
    auto fields = parseAddress(address_);
    if (!fields) throw UsageError(session.texts.format(Text::BadAddress, address_));
    location.update(*fields);
  }
  const char* trigger = arrives_ ? kOnArrival : leaves_ ? kOnDeparture : kImmediate;
  return {{"class", "AXKynGeoFenceSet"},
          {"friend", resolveFriend(session, friend_)},
          {"requestedLocation", location},
          {"geoFenceTrigger", trigger},
          {"oneTimeOnly", once_ || now_},  // a "now" notice comes once
          {"fenceType", them_ ? kNotifyOthers : kNotifyMe},
          {"enable", !off_}};
}

std::optional<Json> parseAddress(const std::string& text) {
  std::vector<std::string> parts;
  std::stringstream in(text);
  for (std::string part; std::getline(in, part, ',');) parts.push_back(trimmed(part));
  if (!text.empty() && text.back() == ',') parts.emplace_back();
  if (parts.size() < 2 || parts.size() > 5 || parts[0].empty() || parts[1].empty()) return std::nullopt;
  Json fields = {{"street", parts[0]}, {"city", parts[1]}};

  // After the city: the part with a digit is the postal code, a part before it the state and one
  // after it the country; without a postal code, the state and then the country.
  const std::vector<std::string> rest(parts.begin() + 2, parts.end());
  std::size_t postal = rest.size();
  for (std::size_t i = 0; i < rest.size(); ++i) {
    if (hasDigit(rest[i])) {
      postal = i;
      break;
    }
  }
  std::string state, code, country;
  if (postal < rest.size()) {
    if (postal > 1 || rest.size() - postal > 2) return std::nullopt;
    if (postal == 1) state = rest[0];
    code = rest[postal];
    if (postal + 1 < rest.size()) country = rest[postal + 1];
  } else {
    if (rest.size() > 2) return std::nullopt;
    if (!rest.empty()) state = rest[0];
    if (rest.size() == 2) country = rest[1];
  }
  if (!country.empty()) {
    if (country.size() != 2 || !std::isalpha(static_cast<unsigned char>(country[0])) ||
        !std::isalpha(static_cast<unsigned char>(country[1]))) {
      return std::nullopt;
    }
    for (char& c : country) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    fields["countryCode"] = country;
  }
  if (!state.empty()) fields["stateCode"] = state;
  if (!code.empty()) fields["postalCode"] = code;
  return fields;
}

void printGeoFence(Session& session, const Json& command, const Json& reply, std::ostream& out) {
  const Texts& texts = session.texts;
  const Json& fence = memberOf(reply, "geoFence");
  std::string trigger = textOf(fence, "trigger");
  if (trigger.empty()) trigger = textOf(command, "geoFenceTrigger");
  const bool on = flagOf(command, "enable");
  const bool them = textOf(command, "fenceType") != kNotifyMe;
  const std::string name = friendName(texts, command, fence), place = placeName(command, fence);

  // Rows: arrives, leaves, now; columns: me on, them on, me off, them off.
  constexpr Text kSentences[3][4] = {
      {Text::FenceMeArrives, Text::FenceThemArrives, Text::FenceOffMeArrives, Text::FenceOffThemArrives},
      {Text::FenceMeLeaves, Text::FenceThemLeaves, Text::FenceOffMeLeaves, Text::FenceOffThemLeaves},
      {Text::FenceMeNow, Text::FenceThemNow, Text::FenceOffMeNow, Text::FenceOffThemNow}};
  const int row = trigger == kOnArrival ? 0 : trigger == kOnDeparture ? 1 : trigger == kImmediate ? 2 : -1;
  std::string line = row < 0 ? texts.format(on ? Text::FenceSet : Text::FenceOff, name, place)
                             : texts.format(kSentences[row][(on ? 0 : 2) + (them ? 1 : 0)], name, place);
  const Json& once = memberOf(command, "oneTimeOnly");
  if (on && row != 2 && once.is_boolean() && once.get<bool>()) line += " " + std::string(texts[Text::FenceOnce]);
  out << line << "\n";
}

}  // namespace kyn::cli
