// Turning what the user typed into the people and places of an assistant command.
#include "Host.h"

#include <cctype>
#include <cstring>
#include <sstream>
#include <vector>

namespace kyn::cli {
namespace {

bool looksLikePhoneNumber(const std::string& text) {
  int digits = 0;
  for (unsigned char c : text) {
    if (std::isdigit(c)) ++digits;
    else if (std::strchr("+()-. /", c) == nullptr) return false;
  }
  return digits >= 3;
}

std::string lower(std::string s) {
  for (char& c : s) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return s;
}

std::optional<Json> parsed(const std::optional<std::string>& text) {
  if (!text) return std::nullopt;
  Json value = Json::parse(*text, nullptr, /*allow_exceptions=*/false);
  if (value.is_discarded()) return std::nullopt;
  return value;
}

}  // namespace

Json resolveFriend(Session& session, const std::string& who) {
  const bool email = who.find('@') != std::string::npos;
  if (email || looksLikePhoneNumber(who)) {
    if (auto person = parsed(session.plugin.take(session.plugin.findPerson(who.c_str())))) return *person;
    if (email) return Json{{"class", "AXPerson"}, {"emails", Json::array({{{"class", "AXEmail"}, {"emailAddress", who}}})}};
    return Json{{"class", "AXPerson"}, {"phones", Json::array({{{"class", "AXPhone"}, {"number", who}}})}};
  }
  const auto people = parsed(session.plugin.take(session.plugin.findPeople(who.c_str())));
  if (!people || !people->is_array() || people->empty()) throw UsageError(session.texts.format(Text::NoOneNamed, who));
  if (people->size() == 1) return people->front();
  for (const auto& person : *people) {
    if (lower(person.value("fullName", "")) == lower(who)) return person;
  }
  std::string message = session.texts.format(Text::SeveralPeople, who);
  for (const auto& person : *people) {
    message += "\n  " + person.value("fullName", std::string(session.texts[Text::NoName]));
  }
  message += "\n";
  message += session.texts[Text::SayWhichOne];
  throw UsageError(message);
}

bool flagOf(const Json& command, const char* key) {
  const Json flag = command.is_object() ? command.value(key, Json()) : Json();
  return flag.is_boolean() ? flag.get<bool>() : flag.is_number() && flag.get<double>() != 0;
}

std::optional<Json> parseCoordinate(const std::string& text, bool allowAccuracy) {
  std::vector<double> parts;
  std::stringstream in(text);
  std::string item;
  while (std::getline(in, item, ',')) {
    try {
      std::size_t used = 0;
      parts.push_back(std::stod(item, &used));
      if (used != item.size()) return std::nullopt;
    } catch (...) {
      return std::nullopt;
    }
  }
  if (parts.size() < 2 || parts.size() > (allowAccuracy ? 3u : 2u)) return std::nullopt;
  if (!(parts[0] >= -90 && parts[0] <= 90 && parts[1] >= -180 && parts[1] <= 180)) return std::nullopt;
  Json location = {{"class", "AXLocation"}, {"latitude", parts[0]}, {"longitude", parts[1]}};
  if (parts.size() == 3) location["accuracy"] = parts[2];
  return location;
}

Json namedPlace(Session& session, const std::string& label, const std::string& coordinate) {
  Json place = {{"class", "AXLocation"}};
  if (!coordinate.empty()) {
    auto location = parseCoordinate(coordinate, false);
    if (!location) throw UsageError(session.texts.format(Text::BadPlaceAt, coordinate));
    place = *location;
  }
  if (!label.empty()) place["label"] = label;
  return place;
}

}  // namespace kyn::cli
