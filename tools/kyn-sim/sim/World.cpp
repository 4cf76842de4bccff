#include "sim/World.h"

#include "sim/GetLocations.h"
#include "sim/RequestLog.h"

#include <algorithm>
#include <cctype>
#include <cmath>

namespace kyn::sim {

namespace {

// Two unlabelled places this close are the same place.
constexpr double kSamePlace = 25.0;
// An address of the gazetteer describes a coordinate this close to it.
constexpr double kNearby = 150.0;

const char* flag(bool value) { return value ? "true" : "false"; }

// Lower case, blanks collapsed and trimmed: how addresses are compared.
std::string normalised(std::string_view text) {
  std::string out;
  for (const unsigned char c : text) {
    if (std::isspace(c)) {
      if (!out.empty() && out.back() != ' ') out.push_back(' ');
    } else {
      out.push_back(static_cast<char>(std::tolower(c)));
    }
  }
  if (!out.empty() && out.back() == ' ') out.pop_back();
  return out;
}

std::string stringMember(const Json& object, const char* key) {
  const auto it = object.find(key);
  return it != object.end() && it->is_string() ? it->get<std::string>() : std::string();
}

bool samePlace(const Place& a, const Place& b) {
  if (!a.label.empty() || !b.label.empty()) return equalsIgnoringCase(a.label, b.label);
  return distanceInMeters(a.coordinate, b.coordinate) <= kSamePlace;
}

std::vector<std::string> keysOf(const std::vector<std::string>& handles) {
  std::vector<std::string> keys;
  for (const auto& h : handles) keys.push_back(handleKey(h));
  std::sort(keys.begin(), keys.end());
  return keys;
}

bool shareAny(const std::vector<std::string>& a, const std::vector<std::string>& b) {
  return std::any_of(a.begin(), a.end(), [&](const std::string& x) {
    return std::any_of(b.begin(), b.end(), [&](const std::string& y) { return handleKey(x) == handleKey(y); });
  });
}

}  // namespace

World::World(DataSet data, Sink notify) : data_(std::move(data)), notify_(std::move(notify)) {}

AccountView World::view(std::size_t account) const {
  std::lock_guard lock(mutex_);
  return data_.view(account);
}

Json World::setHidden(std::size_t account, bool hidden, std::int64_t nowMs) {
  std::lock_guard lock(mutex_);
  Account& holder = data_.accounts.at(account);
  const bool shown = holder.hidden && !hidden;
  holder.hidden = hidden;
  Json fired = Json::array();
  if (shown && !holder.handle.empty()) judgeAll(holder.handle, nowMs, fired);

  const Whereabouts* own = holder.handle.empty() ? nullptr : data_.whereabouts(holder.handle);
  Json info = {{"location", own ? locationAsSent(*own, nowMs) : Json(nullptr)}};
  if (isEmailHandle(holder.handle)) info["preferredEmail"] = holder.handle;
  return info;
}

std::vector<std::string> World::friendsNamed(const Account& account, const std::vector<std::string>& handles) const {
  std::vector<std::string> found;
  for (const auto& handle : handles) {
    const auto f = std::find_if(account.friends.begin(), account.friends.end(),
                                [&](const Friendship& x) { return handleKey(x.handle) == handleKey(handle); });
    if (f != account.friends.end() && std::find(found.begin(), found.end(), f->handle) == found.end()) {
      found.push_back(f->handle);
    }
  }
  return found;
}

const Place* World::gazetteerEntry(const FenceRequest& request) const {
  std::string street = stringMember(request.fullAddress, "streetAddress");
  if (street.empty()) street = request.address.substr(0, request.address.find('\n'));
  street = normalised(street);
  if (street.empty()) return nullptr;
  const std::string locality = normalised(stringMember(request.fullAddress, "locality"));
  for (const Place& entry : data_.gazetteer) {
    const std::string entryLocality = normalised(stringMember(entry.address, "locality"));
    if (normalised(stringMember(entry.address, "streetAddress")) == street &&
        (locality.empty() || entryLocality.empty() || locality == entryLocality)) {
      return &entry;
    }
  }
  return nullptr;
}

Json World::addressNear(Coordinate coordinate) const {
  const Place* nearest = nullptr;
  double best = kNearby;
  for (const Place& entry : data_.gazetteer) {
    const double d = distanceInMeters(entry.coordinate, coordinate);
    if (d <= best) {
      best = d;
      nearest = &entry;
    }
  }
  return nearest ? nearest->address : Json::object();
}

World::Placed World::locate(std::size_t owner, const FenceRequest& request,
                            const std::vector<std::string>& subjects) const {
  const Account& account = data_.accounts[owner];
  Place place;
  place.label = request.label;
  if (request.coordinate) {
    place.coordinate = *request.coordinate;
    place.radius = std::max(kDefaultFenceRadius, request.accuracy);
    place.address = request.fullAddress.empty() ? addressNear(place.coordinate) : request.fullAddress;
    return {place, 0};
  }
  if (!request.label.empty()) {
    const auto known = std::find_if(account.places.begin(), account.places.end(),
                                    [&](const Place& p) { return equalsIgnoringCase(p.label, request.label); });
    if (known != account.places.end()) {
      place = *known;
      if (place.address.empty()) place.address = addressNear(place.coordinate);
      return {place, 0};
    }
  }
  if (const Place* entry = gazetteerEntry(request)) {
    place.coordinate = entry->coordinate;
    place.radius = entry->radius;
    place.address = entry->address;
    return {place, 0};
  }
  if (!request.label.empty()) return {std::nullopt, 521};
  const bool addressGiven = !normalised(request.address).empty() || !request.fullAddress.empty();
  // Nothing named: the fence is where the watched person is now ("tell me when Ada leaves").
  if (!addressGiven && subjects.size() == 1) {
    if (const auto here = seenBy(owner, subjects.front())) {
      place.coordinate = *here;
      place.address = addressNear(*here);
      return {place, 0};
    }
  }
  return {std::nullopt, 535};
}

std::optional<Coordinate> World::seenBy(std::size_t owner, std::string_view handle) const {
  const Whereabouts* w = data_.shownWhereabouts(handle);
  if (!w || !w->coordinate) return std::nullopt;
  const auto& friends = data_.accounts[owner].friends;
  const bool pending = std::any_of(friends.begin(), friends.end(), [&](const Friendship& f) {
    return f.pending && handleKey(f.handle) == handleKey(handle);
  });
  if (pending) return std::nullopt;
  return w->coordinate;
}

void World::judge(Fence& fence, const std::string& subject, bool settingUp, std::int64_t nowMs, Json& fired) {
  const auto where = seenBy(fence.owner, subject);
  const std::string key = handleKey(subject);
  if (!where) {
    // Unknown whereabouts change nothing; a fence starts out with its person outside.
    fence.inside.try_emplace(key, false);
    return;
  }
  const double distance = distanceInMeters(*where, fence.place.coordinate);
  const bool inside = distance <= fence.radius;
  const bool wasInside = fence.inside.try_emplace(key, false).first->second;
  fence.inside[key] = inside;
  if (!fence.on) return;

  const char* transition = nullptr;
  if (settingUp) {
    if (fence.trigger == "immediate" && inside) transition = "immediate";
  } else if (!wasInside && inside && (fence.trigger == "enter" || fence.trigger == "immediate")) {
    transition = "enter";
  } else if (wasInside && !inside && fence.trigger == "exit") {
    transition = "exit";
  }
  if (!transition) return;

  Json notification = {
      {"time", isoTime(std::chrono::system_clock::time_point(std::chrono::milliseconds(nowMs)))},
      {"fence", fence.id},
      {"account", data_.accounts[fence.owner].personId},
      {"type", fence.notifyMe ? "NotifyMe" : "NotifyOthers"},
      {"to", fence.recipients},
      {"about", subject},
      {"transition", transition},
      {"place", fence.place.label.empty() ? Json(nullptr) : Json(fence.place.label)},
      {"latitude", fence.place.coordinate.latitude},
      {"longitude", fence.place.coordinate.longitude},
      {"radius", fence.radius},
      {"distanceInMeters", std::round(distance * 10) / 10}};
  if (fence.oneTimeOnly) fence.on = false;
  if (notify_) notify_(notification);
  fired.push_back(std::move(notification));
}

void World::judgeAll(std::string_view subject, std::int64_t nowMs, Json& fired) {
  const std::string key = handleKey(subject);
  for (Fence& fence : fences_) {
    for (const auto& s : fence.subjects) {
      if (handleKey(s) == key) judge(fence, s, false, nowMs, fired);
    }
  }
}

Json World::describe(const Fence& fence) const {
  Json out = {{"id", fence.id},
              {"emails", fence.friends},
              {"latitude", fence.place.coordinate.latitude},
              {"longitude", fence.place.coordinate.longitude},
              {"radius", fence.radius}};
  if (!fence.place.label.empty()) out["label"] = fence.place.label;
  out["trigger"] = fence.trigger;
  out["onetimeonly"] = flag(fence.oneTimeOnly);
  out["type"] = fence.notifyMe ? "NotifyMe" : "NotifyOthers";
  out["isOn"] = flag(fence.on);
  return out;
}

FenceAnswer World::setFence(std::size_t owner, const FenceRequest& request, std::int64_t nowMs) {
  std::lock_guard lock(mutex_);
  const Account& account = data_.accounts.at(owner);
  if (account.friends.empty()) return {417, nullptr, nullptr};
  const std::vector<std::string> friends = friendsNamed(account, request.emails);
  if (friends.empty()) return {411, nullptr, nullptr};
  const std::vector<std::string> friendKeys = keysOf(friends);
  std::vector<std::string> subjects = friends;
  std::vector<std::string> recipients{account.handle.empty() ? account.personId : account.handle};
  if (!request.notifyMe) {
    subjects.clear();
    if (!account.handle.empty()) subjects.push_back(account.handle);
    recipients = friends;
  }
  const auto sameFence = [&](const Fence& f) {
    return f.owner == owner && f.notifyMe == request.notifyMe && keysOf(f.friends) == friendKeys;
  };

  if (!request.on) {
    // Matched by label, else by coordinate, else every fence about these friends; by trigger when given.
    for (Fence& f : fences_) {
      if (!sameFence(f) || (!request.trigger.empty() && f.trigger != request.trigger)) continue;
      if (!request.label.empty() && !equalsIgnoringCase(f.place.label, request.label)) continue;
      if (request.label.empty() && request.coordinate &&
          distanceInMeters(f.place.coordinate, *request.coordinate) > kSamePlace) {
        continue;
      }
      f.on = false;
    }
    return {221, nullptr, nullptr};
  }

  Placed placed = locate(owner, request, subjects);
  if (!placed.place) return {placed.status, nullptr, nullptr};
  Place& place = *placed.place;
  const double radius = place.radius.value_or(kDefaultFenceRadius);
  if (radius > kMaxFenceRadius) return {543, nullptr, nullptr};
  if (request.trigger == "immediate" && !request.oneTimeOnly) return {544, nullptr, nullptr};

  auto fence = std::find_if(fences_.begin(), fences_.end(), [&](const Fence& f) {
    return sameFence(f) && f.trigger == request.trigger && samePlace(f.place, place);
  });
  if (fence == fences_.end() || !fence->on) {
    const auto active = [&](auto&& also) {
      return static_cast<std::size_t>(std::count_if(fences_.begin(), fences_.end(), [&](const Fence& f) {
        return f.on && f.owner == owner && also(f);
      }));
    };
    if (active([](const Fence&) { return true; }) >= kMaxFencesPerAccount) return {541, nullptr, nullptr};
    if (active([&](const Fence& f) { return shareAny(f.friends, friends); }) >= kMaxFencesPerFriend) {
      return {542, nullptr, nullptr};
    }
  }
  if (fence == fences_.end()) {
    Fence made;
    made.id = "fence-" + std::to_string(++fencesMade_);
    made.owner = owner;
    made.notifyMe = request.notifyMe;
    made.friends = friends;
    made.subjects = subjects;
    made.recipients = recipients;
    made.trigger = request.trigger;
    fences_.push_back(std::move(made));
    fence = std::prev(fences_.end());
  }
  fence->place = place;
  fence->radius = radius;
  fence->oneTimeOnly = request.oneTimeOnly;
  fence->on = true;
  fence->inside.clear();
  Json fired = Json::array();
  for (const auto& subject : fence->subjects) judge(*fence, subject, true, nowMs, fired);
  return {200, describe(*fence), place.address};
}

std::optional<Json> World::move(std::string_view handle, Coordinate to, std::optional<double> accuracy,
                                std::int64_t nowMs) {
  std::lock_guard lock(mutex_);
  const std::string key = handleKey(handle);
  const bool known = data_.people.count(key) > 0 || data_.holder(handle) ||
                     std::any_of(data_.accounts.begin(), data_.accounts.end(), [&](const Account& a) {
                       return std::any_of(a.friends.begin(), a.friends.end(),
                                          [&](const Friendship& f) { return handleKey(f.handle) == key; });
                     });
  if (!known) return std::nullopt;

  Whereabouts& w = data_.people[key];
  Json location = {{"latitude", to.latitude}, {"longitude", to.longitude}};
  if (!accuracy && w.location && w.location->contains("horizontalAccuracy")) {
    location["horizontalAccuracy"] = (*w.location)["horizontalAccuracy"];
  } else if (accuracy) {
    location["horizontalAccuracy"] = *accuracy;
  }
  // What a reverse look-up would tell: the address of the spot and the mover's own name for it.
  Json address = addressNear(to);
  if (address.contains("streetAddress")) location["streetAddress"] = address["streetAddress"];
  address.erase("streetAddress");
  address.erase("streetName");
  if (const Account* holder = data_.holder(handle)) {
    Json labels = Json::array();
    for (const Place& p : holder->places) {
      if (distanceInMeters(p.coordinate, to) <= p.radius.value_or(kDefaultFenceRadius)) {
        labels.push_back({{"label", p.label}});
      }
    }
    if (!labels.empty()) location["labels"] = std::move(labels);
  }
  if (!address.empty()) location["address"] = std::move(address);
  w.location = std::move(location);
  w.coordinate = to;
  w.ageSeconds.reset();
  w.timestampMs = nowMs;

  Json fired = Json::array();
  judgeAll(handle, nowMs, fired);
  return Json{{"handle", handle}, {"location", locationAsSent(w, nowMs)}, {"notifications", std::move(fired)}};
}

}  // namespace kyn::sim
