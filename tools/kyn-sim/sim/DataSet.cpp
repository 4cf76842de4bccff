#include "sim/DataSet.h"

#include <algorithm>
#include <cctype>
#include <stdexcept>

namespace kyn::sim {

namespace {

// The address members a place may carry; a fence answer sends them as its "fullAddress".
constexpr const char* kAddressMembers[] = {"streetAddress", "streetName", "locality", "stateCode", "country"};

[[noreturn]] void reject(const std::string& where, const std::string& why) {
  throw std::invalid_argument(where.empty() ? why : where + ": " + why);
}

std::int64_t wholeNumber(const Json& value, const std::string& where) {
  if (value.is_number_integer()) return value.get<std::int64_t>();
  if (value.is_number_float()) {
    const double d = value.get<double>();
    if (d == static_cast<double>(static_cast<std::int64_t>(d))) return static_cast<std::int64_t>(d);
  }
  reject(where, "must be a whole number");
}

Coordinate coordinateOf(const Json& value, const std::string& where) {
  const auto lat = value.find("latitude");
  const auto lon = value.find("longitude");
  if (lat == value.end() || !lat->is_number() || lon == value.end() || !lon->is_number()) {
    reject(where, "needs numeric \"latitude\" and \"longitude\"");
  }
  const Coordinate c{lat->get<double>(), lon->get<double>()};
  if (c.latitude < -90 || c.latitude > 90 || c.longitude < -180 || c.longitude > 180) {
    reject(where, "latitude or longitude out of range");
  }
  return c;
}

void checkHandle(const std::string& handle, const std::string& where) {
  if (handle.empty()) reject(where, "a handle is empty");
  if (!isEmailHandle(handle) && !isE164(handle)) {
    reject(where, "a handle is an e-mail address or a phone number in E.164 form (+15035550101)");
  }
}

// Reads the data set step by step; remembers where each person's whereabouts were given, since
// they may be given once only.
class Parser {
 public:
  DataSet parse(std::string_view text) {
    Json document;
    try {
      document = Json::parse(text);
    } catch (const Json::parse_error& e) {
      reject("", std::string("not valid JSON: ") + e.what());
    }
    if (!document.is_object()) reject("", "must be a JSON object");

    for (const auto& [key, value] : document.items()) {
      if (key == "friends") {
        data_.accounts[0].friends = parseFriends(value, "friends");
      } else if (key == "me") {
        parseMe(value, data_.accounts[0], "me");
      } else if (key == "accounts") {
        parseAccounts(value);
      } else if (key == "gazetteer") {
        if (!value.is_array()) reject("gazetteer", "must be an array of addresses");
        for (std::size_t i = 0; i < value.size(); ++i) {
          data_.gazetteer.push_back(parsePlace(value[i], "gazetteer[" + std::to_string(i) + "]", true));
        }
      } else if (key == "serverContext") {
        if (!value.is_object()) reject("serverContext", "must be an object");
        data_.serverContext = value;
      } else if (key != "comment") {
        reject(key, "unknown member (known: friends, me, accounts, gazetteer, serverContext, comment)");
      }
    }
    for (const Account& account : data_.accounts) {
      if (account.handle.empty()) continue;
      const auto own = std::find_if(account.friends.begin(), account.friends.end(), [&](const Friendship& f) {
        return handleKey(f.handle) == handleKey(account.handle);
      });
      if (own != account.friends.end()) reject(account.handle, "an account holder cannot be their own friend");
      if (data_.holder(account.handle) != &account) reject(account.handle, "holds two accounts");
    }
    return std::move(data_);
  }

 private:
  // The "location", "ageSeconds" or "timestamp" member of an entry that places someone.
  static bool readWhereabouts(const std::string& key, const Json& value, const std::string& where, Whereabouts& w) {
    if (key == "location") {
      if (value.is_null()) return true;
      if (!value.is_object()) reject(where + ".location", "must be an object or null");
      const Coordinate c = coordinateOf(value, where + ".location");
      if (value.contains("timestamp")) {
        reject(where + ".location.timestamp", "give the time as \"ageSeconds\" or \"timestamp\" beside \"location\"");
      }
      w.location = value;
      w.coordinate = c;
    } else if (key == "ageSeconds") {
      w.ageSeconds = wholeNumber(value, where + ".ageSeconds");
      if (*w.ageSeconds < 0) reject(where + ".ageSeconds", "must not be negative");
    } else if (key == "timestamp") {
      w.timestampMs = wholeNumber(value, where + ".timestamp");
    } else {
      return false;
    }
    return true;
  }

  void addWhereabouts(const std::string& handle, Whereabouts w, const std::string& where) {
    if (w.ageSeconds && w.timestampMs) reject(where, "give \"ageSeconds\" or \"timestamp\", not both");
    const auto [it, added] = givenAt_.emplace(handleKey(handle), where);
    if (!added) reject(where, "the whereabouts of " + handle + " are given in " + it->second + " already");
    data_.people[handleKey(handle)] = std::move(w);
  }

  std::vector<Friendship> parseFriends(const Json& value, const std::string& where) {
    if (!value.is_object()) reject(where, "must be an object keyed by handle");
    std::vector<Friendship> friends;
    for (const auto& [handle, entry] : value.items()) {
      const std::string place = where + "." + handle;
      checkHandle(handle, place);
      if (!entry.is_object()) reject(place, "must be an object");
      Friendship f{handle, false};
      Whereabouts w;
      bool placed = false;
      for (const auto& [key, member] : entry.items()) {
        if (key == "pending") {
          if (!member.is_boolean()) reject(place + ".pending", "must be true or false");
          f.pending = member.get<bool>();
        } else if (readWhereabouts(key, member, place, w)) {
          placed = true;
        } else if (key != "comment") {
          reject(place + "." + key, "unknown member (known: location, ageSeconds, timestamp, pending, comment)");
        }
      }
      if (std::any_of(friends.begin(), friends.end(),
                      [&](const Friendship& other) { return handleKey(other.handle) == handleKey(handle); })) {
        reject(place, "the same handle appears twice");
      }
      if (placed) addWhereabouts(handle, std::move(w), place);
      friends.push_back(std::move(f));
    }
    return friends;
  }

  void parseMe(const Json& value, Account& account, const std::string& where) {
    if (!value.is_object()) reject(where, "must be an object");
    const auto handle = value.find("handle");
    if (handle == value.end() || !handle->is_string()) reject(where + ".handle", "the holder's handle is missing");
    account.handle = handle->get<std::string>();
    checkHandle(account.handle, where + ".handle");
    Whereabouts w;
    bool placed = false;
    for (const auto& [key, member] : value.items()) {
      if (key == "hidden") {
        if (!member.is_boolean()) reject(where + ".hidden", "must be true or false");
        account.hidden = member.get<bool>();
      } else if (key == "places") {
        if (!member.is_object()) reject(where + ".places", "must be an object keyed by label");
        for (const auto& [label, place] : member.items()) {
          if (label.empty()) reject(where + ".places", "a label is empty");
          account.places.push_back(parsePlace(place, where + ".places." + label, false));
          account.places.back().label = label;
        }
      } else if (readWhereabouts(key, member, where, w)) {
        placed = true;
      } else if (key != "handle" && key != "comment") {
        reject(where + "." + key,
               "unknown member (known: handle, location, ageSeconds, timestamp, hidden, places, comment)");
      }
    }
    if (placed) addWhereabouts(account.handle, std::move(w), where);
  }

  void parseAccounts(const Json& value) {
    if (!value.is_object()) reject("accounts", "must be an object keyed by person id");
    for (const auto& [personId, entry] : value.items()) {
      const std::string where = "accounts." + personId;
      if (personId.empty() || personId.find_first_of(": \t") != std::string::npos) {
        reject(where, "a person id is not empty and holds no colon or blank");
      }
      if (!entry.is_object()) reject(where, "must be an object");
      Account account;
      account.personId = personId;
      for (const auto& [key, member] : entry.items()) {
        if (key == "me") {
          parseMe(member, account, where + ".me");
        } else if (key == "friends") {
          account.friends = parseFriends(member, where + ".friends");
        } else if (key != "comment") {
          reject(where + "." + key, "unknown member (known: me, friends, comment)");
        }
      }
      data_.accounts.push_back(std::move(account));
    }
  }

  static Place parsePlace(const Json& value, const std::string& where, bool needsStreet) {
    if (!value.is_object()) reject(where, "must be an object");
    Place place;
    place.coordinate = coordinateOf(value, where);
    for (const auto& [key, member] : value.items()) {
      if (key == "radius") {
        if (!member.is_number() || member.get<double>() <= 0) reject(where + ".radius", "must be a positive number");
        place.radius = member.get<double>();
      } else if (std::find(std::begin(kAddressMembers), std::end(kAddressMembers), key) != std::end(kAddressMembers)) {
        if (!member.is_string()) reject(where + "." + key, "must be a string");
        place.address[key] = member;
      } else if (key != "latitude" && key != "longitude" && key != "comment") {
        reject(where + "." + key,
               "unknown member (known: latitude, longitude, radius, streetAddress, streetName, locality, stateCode, "
               "country, comment)");
      }
    }
    if (needsStreet && !place.address.contains("streetAddress")) reject(where, "needs a \"streetAddress\"");
    return place;
  }

  DataSet data_;
  std::map<std::string, std::string> givenAt_;
};

}  // namespace

bool equalsIgnoringCase(std::string_view a, std::string_view b) noexcept {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](unsigned char x, unsigned char y) {
           return std::tolower(x) == std::tolower(y);
         });
}

bool isEmailHandle(std::string_view handle) noexcept { return handle.find('@') != std::string_view::npos; }

bool isE164(std::string_view text) noexcept {
  if (text.size() < 3 || text.size() > 16 || text[0] != '+' || text[1] == '0') return false;
  return std::all_of(text.begin() + 1, text.end(), [](unsigned char c) { return std::isdigit(c) != 0; });
}

std::string handleKey(std::string_view handle) {
  std::string key(handle);
  if (isEmailHandle(handle)) {
    for (auto& c : key) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  }
  return key;
}

const Friend* AccountView::findFriend(std::string_view handle) const {
  const bool email = isEmailHandle(handle);
  for (const auto& f : friends) {
    if (email ? equalsIgnoringCase(f.handle, handle) : f.handle == handle) return &f;
  }
  return nullptr;
}

const Whereabouts* DataSet::whereabouts(std::string_view handle) const {
  const auto it = people.find(handleKey(handle));
  return it == people.end() ? nullptr : &it->second;
}

const Account* DataSet::holder(std::string_view handle) const {
  const std::string key = handleKey(handle);
  for (const auto& account : accounts) {
    if (!account.handle.empty() && handleKey(account.handle) == key) return &account;
  }
  return nullptr;
}

const Whereabouts* DataSet::shownWhereabouts(std::string_view handle) const {
  const Whereabouts* w = whereabouts(handle);
  if (!w) return nullptr;
  const Account* holderOf = holder(handle);
  return holderOf && holderOf->hidden ? nullptr : w;
}

AccountView DataSet::view(std::size_t account) const {
  AccountView view;
  view.serverContext = serverContext;
  for (const auto& friendship : accounts.at(account).friends) {
    Friend f{friendship.handle, friendship.pending, {}};
    if (const Whereabouts* w = shownWhereabouts(friendship.handle)) f.whereabouts = *w;
    view.friends.push_back(std::move(f));
  }
  return view;
}

DataSet parseDataSet(std::string_view text) { return Parser().parse(text); }

}  // namespace kyn::sim
