#include "sim/DataSet.h"

#include <algorithm>
#include <cctype>
#include <stdexcept>

namespace kyn::sim {

namespace {

[[noreturn]] void reject(const std::string& where, const std::string& why) {
  throw std::invalid_argument(where.empty() ? why : where + ": " + why);
}

bool equalsIgnoringCase(std::string_view a, std::string_view b) noexcept {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](unsigned char x, unsigned char y) {
           return std::tolower(x) == std::tolower(y);
         });
}

std::int64_t wholeNumber(const Json& value, const std::string& where) {
  if (value.is_number_integer()) return value.get<std::int64_t>();
  if (value.is_number_float()) {
    const double d = value.get<double>();
    if (d == static_cast<double>(static_cast<std::int64_t>(d))) return static_cast<std::int64_t>(d);
  }
  reject(where, "must be a whole number");
}

Friend parseFriend(const std::string& handle, const Json& entry) {
  const std::string where = "friends." + handle;
  if (handle.empty()) reject("friends", "a friend's handle is empty");
  if (!isEmailHandle(handle) && !isE164(handle)) {
    reject(where, "a handle is an e-mail address or a phone number in E.164 form (+15035550101)");
  }
  if (!entry.is_object()) reject(where, "must be an object");

  Friend f;
  f.handle = handle;
  for (const auto& [key, value] : entry.items()) {
    if (key == "pending") {
      if (!value.is_boolean()) reject(where + ".pending", "must be true or false");
      f.pending = value.get<bool>();
    } else if (key == "location") {
      if (value.is_null()) continue;
      if (!value.is_object()) reject(where + ".location", "must be an object or null");
      const auto lat = value.find("latitude");
      const auto lon = value.find("longitude");
      if (lat == value.end() || !lat->is_number() || lon == value.end() || !lon->is_number()) {
        reject(where + ".location", "needs numeric \"latitude\" and \"longitude\"");
      }
      const double latitude = lat->get<double>();
      const double longitude = lon->get<double>();
      if (latitude < -90 || latitude > 90 || longitude < -180 || longitude > 180) {
        reject(where + ".location", "latitude or longitude out of range");
      }
      if (value.contains("timestamp")) {
        reject(where + ".location.timestamp", "give the time as \"ageSeconds\" or \"timestamp\" beside \"location\"");
      }
      f.location = value;
      f.coordinate = Coordinate{latitude, longitude};
    } else if (key == "ageSeconds") {
      f.ageSeconds = wholeNumber(value, where + ".ageSeconds");
      if (*f.ageSeconds < 0) reject(where + ".ageSeconds", "must not be negative");
    } else if (key == "timestamp") {
      f.timestampMs = wholeNumber(value, where + ".timestamp");
    } else if (key != "comment") {
      reject(where + "." + key, "unknown member (known: location, ageSeconds, timestamp, pending, comment)");
    }
  }
  if (f.ageSeconds && f.timestampMs) reject(where, "give \"ageSeconds\" or \"timestamp\", not both");
  return f;
}

}  // namespace

bool isEmailHandle(std::string_view handle) noexcept { return handle.find('@') != std::string_view::npos; }

bool isE164(std::string_view text) noexcept {
  if (text.size() < 3 || text.size() > 16 || text[0] != '+' || text[1] == '0') return false;
  return std::all_of(text.begin() + 1, text.end(), [](unsigned char c) { return std::isdigit(c) != 0; });
}

const Friend* DataSet::findFriend(std::string_view handle) const {
  const bool email = isEmailHandle(handle);
  for (const auto& f : friends) {
    if (email ? equalsIgnoringCase(f.handle, handle) : f.handle == handle) return &f;
  }
  return nullptr;
}

DataSet parseDataSet(std::string_view text) {
  Json document;
  try {
    document = Json::parse(text);
  } catch (const Json::parse_error& e) {
    reject("", std::string("not valid JSON: ") + e.what());
  }
  if (!document.is_object()) reject("", "must be a JSON object");

  DataSet data;
  for (const auto& [key, value] : document.items()) {
    if (key == "friends") {
      if (!value.is_object()) reject("friends", "must be an object keyed by handle");
      for (const auto& [handle, entry] : value.items()) {
        Friend f = parseFriend(handle, entry);
        if (data.findFriend(f.handle)) reject("friends." + handle, "the same handle appears twice");
        data.friends.push_back(std::move(f));
      }
    } else if (key == "serverContext") {
      if (!value.is_object()) reject("serverContext", "must be an object");
      data.serverContext = value;
    } else if (key != "comment") {
      reject(key, "unknown member (known: friends, serverContext, comment)");
    }
  }
  return data;
}

}  // namespace kyn::sim
