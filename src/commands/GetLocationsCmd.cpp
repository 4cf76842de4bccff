#include "commands/GetLocationsCmd.h"

#include "account/Common.h"
#include "model/KYNAXLocation.h"
#include "platform/Services.h"
#include "platform/text/Words.h"
#include "platform/value/Json.h"
#include "utils/KYNAXUtils.h"

#include <array>
#include <bit>
#include <cstdint>
#include <functional>
#include <span>
#include <type_traits>
#include <utility>
#include <vector>

namespace kyn {

using platform::services;

namespace {

/// A hash of a handle (an e-mail address or a phone number: short), a word at a time.
std::size_t handleHash(std::string_view handle) noexcept {
  const char* const p = handle.data();
  const std::size_t n = handle.size();
  std::uint64_t h = n * 0x9E3779B97F4A7C15u;
  const auto mix = [&h](std::uint64_t word) {
    h = (h ^ word) * 0xBF58476D1CE4E5B9u;
    h ^= h >> 31;
  };
  if (n >= 8) {
    for (std::size_t i = 0; i + 8 < n; i += 8) mix(platform::word8At(p + i));
    mix(platform::word8At(p + n - 8));
  } else if (n >= 4) {
    mix(platform::shortTextWord(p, n));
  } else if (n > 0) {
    mix(static_cast<unsigned char>(p[0]) | (static_cast<std::uint64_t>(static_cast<unsigned char>(p[n / 2])) << 8) |
        (static_cast<std::uint64_t>(static_cast<unsigned char>(p[n - 1])) << 16));
  }
  h *= 0x94D049BB133111EBu;
  return static_cast<std::size_t>(h ^ (h >> 32));
}

/// Values by handle in one array (open addressing), without a node per handle: a search looks up
/// every friend's handle twice, with one hash (`handleHash`). Made for a number of handles; at
/// least half its slots stay free, so that every look-up ends.
template <class V>
class HandleIndex {
 public:
  explicit HandleIndex(std::size_t most) : slots_(std::bit_ceil(std::max<std::size_t>(2 * most, 8))) {}

  /// The value of `handle`, made when new; and whether it was. Null when the index is full.
  std::pair<V*, bool> insert(std::string_view handle) {
    Slot& slot = slots_[place(handle, handleHash(handle))];
    if (slot.used) return {&slot.value, false};
    if (2 * (used_ + 1) > slots_.size()) return {nullptr, false};
    slot = Slot{handle, V{}, true};
    ++used_;
    return {&slot.value, true};
  }
  /// The value of `handle`, whose hash is `hash`, or null.
  [[nodiscard]] const V* find(std::string_view handle, std::size_t hash) const {
    const Slot& slot = slots_[place(handle, hash)];
    return slot.used ? &slot.value : nullptr;
  }

 private:
  struct Slot {
    std::string_view handle;
    V value{};
    bool used = false;
  };
  /// The slot that holds `handle`, else the free one where it goes.
  [[nodiscard]] std::size_t place(std::string_view handle, std::size_t hash) const {
    const std::size_t mask = slots_.size() - 1;
    for (std::size_t i = hash & mask;; i = (i + 1) & mask) {
      if (!slots_[i].used || slots_[i].handle == handle) return i;
    }
  }
  std::vector<Slot> slots_;
  std::size_t used_ = 0;
};

}  // namespace

std::string GetLocationsCmd::path() const { return std::string(KYNUrlBase) + "getlocations"; }

std::optional<std::vector<std::string>> GetLocationsCmd::allFriendsHandles() const {
  if (!friends) return std::nullopt;
  std::vector<std::string> handles;
  handles.reserve(friends->size());
  Common& common = Common::sharedInstance();
  for (const auto& person : *friends) {
    if (person) common.appendHandlesForAXPerson(*person, handles);
  }
  return handles;
}

std::shared_ptr<AXPerson> GetLocationsCmd::friendForHandle(std::string_view handle) const {
  if (!friends) return nullptr;
  for (const auto& person : *friends) {
    if (!person) continue;
    if (person->emails) {
      for (const auto& e : *person->emails) {
        if (e && e->emailAddress == handle) return person;
      }
    }
    if (person->phones) {
      for (const auto& p : *person->phones) {
        if (p && p->number == handle) return person;
      }
    }
  }
  return nullptr;
}

std::optional<Value> GetLocationsCmd::currentLocationDictionary() const {
  return KYNAXUtils::dictionaryForLocation(currentLocation);
}

std::optional<Value> GetLocationsCmd::requestedLocationDictionary() const {
  return KYNAXUtils::dictionaryForLocation(requestedLocation);
}

template <class Sink>
void GetLocationsCmd::bodyMembers(Sink&& sink) const {
  if (auto handles = allFriendsHandles()) sink("handles", *handles);
  if (auto here = currentLocationDictionary()) sink("myLocation", *here);
  if (auto there = requestedLocationDictionary()) sink("requestedLocation", *there);
  if (requestedLocationLabel) sink("label", *requestedLocationLabel);
  if (proximity) sink("proximity", *proximity);
  if (clientId) sink("serverContext", Value{{"clientId", *clientId}});
}

Value GetLocationsCmd::jsonBodyDictionary() const {
  Value body = KYNBaseCmd::jsonBodyDictionary();
  bodyMembers([&](const char* key, auto&& value) { body[key] = std::forward<decltype(value)>(value); });
  return body;
}

std::string GetLocationsCmd::jsonBody() const {
  // The base's members as text, then this command's after them: the text of the whole dictionary.
  // The base's members are the client context, made once for the process: so is their text.
  static const std::string baseText = platform::toJson(KYNBaseCmd::jsonBodyDictionary());
  std::string text;
  text.reserve(baseText.size() + 512);
  text = baseText;
  text.pop_back();  // the closing brace
  bool first = text.size() == 1;
  {
    platform::JsonTextWriter out(text);
    bodyMembers([&](const char* key, const auto& value) {
      if (!first) out += ',';
      first = false;
      out += '"';
      out += key;  // a plain identifier
      out += "\":";
      using T = std::decay_t<decltype(value)>;
      if constexpr (std::is_same_v<T, std::string>) {
        out.string(value);
      } else if constexpr (std::is_same_v<T, std::vector<std::string>>) {
        out += '[';
        for (std::size_t i = 0; i < value.size(); ++i) {
          if (i > 0) out += ',';
          out.string(value[i]);
        }
        out += ']';
      } else {
        out += platform::toJson(value);
      }
    });
    out += '}';
  }
  return text;
}

AXArray<AXKynLocation> GetLocationsCmd::result() {
  auto& log = services().log();
  resultDescription_.reset();
  const platform::JsonView response = jsonResponse();
  log.notice("getlocations_resultDictionary_raw: %@", response);

  platform::JsonView locations = response.member("locations");
  if (!locations.isObject()) locations = {};  // null or the wrong type
  const platform::JsonView handlesToReport = response.member("emails");
  const bool incomplete = platform::int32Value(statusCodeValue()) == 416;
  if (!response) return std::nullopt;

  std::vector<std::shared_ptr<AXKynLocation>> found;

  static const Value kTrue = true;
  takeServerContext(response, incomplete ? std::optional<platform::JsonEntry>({"incomplete", &kTrue}) : std::nullopt,
                    /*logged=*/true);

  // Each handle is looked up once: index the entries and the friends first, so that the walk stays
  // linear in the number of friends. Of a handle the answer repeats, the last entry counts, at the
  // place of the first.
  HandleIndex<platform::JsonView> entries(locations.size());
  std::vector<std::string_view> entryOrder;
  entryOrder.reserve(locations.size());
  for (const auto& [handle, entry] : locations) {
    const auto [value, made] = entries.insert(handle);
    if (value != nullptr) *value = entry;  // the index holds as many as there are entries
    if (made) entryOrder.push_back(handle);
  }
  std::size_t handleCount = 0;
  if (friends) {
    for (const auto& person : *friends) {
      if (person && person->emails) handleCount += person->emails->size();
      if (person && person->phones) handleCount += person->phones->size();
    }
  }
  HandleIndex<const std::shared_ptr<AXPerson>*> personForHandle(handleCount);
  if (friends) {
    for (const auto& person : *friends) {
      if (!person) continue;
      // The first friend that holds a handle, as e-mail address or as phone number, wins.
      const auto hold = [&](std::string_view handle) {
        if (const auto [holder, made] = personForHandle.insert(handle); made) *holder = &person;
      };
      if (person->emails) {
        for (const auto& e : *person->emails) {
          if (e && e->emailAddress) hold(*e->emailAddress);
        }
      }
      if (person->phones) {
        for (const auto& p : *person->phones) {
          if (p && p->number) hold(*p->number);
        }
      }
    }
  }

  found.reserve(handlesToReport.isArray() ? handlesToReport.size() : entryOrder.size());
  auto visit = [&](std::string_view handle) {
    const std::size_t hash = handleHash(handle);
    const platform::JsonView* entryFound = entries.find(handle, hash);
    const platform::JsonView entry = entryFound ? *entryFound : platform::JsonView();
    // The entry's own members and those that the record decodes, in one walk over it.
    static constexpr std::array<std::string_view, 4> kKeys{"status", "match", KYNAXLocation::kEntryKeys[0],
                                                           KYNAXLocation::kEntryKeys[1]};
    std::array<platform::JsonView, kKeys.size()> read;
    entry.members(kKeys, read);
    if (platform::integerValue(read[0]) == 411) return;  // not a friend: left out
    const auto* const* holder = personForHandle.find(handle, hash);
    KYNAXLocation record(std::string(handle), holder ? **holder : nullptr,
                         std::span(read).last<KYNAXLocation::kEntryKeys.size()>());
    if (record.avixLocation) found.push_back(std::move(record.avixLocation));
    atRequestedLocation = platform::boolValue(read[1]).value_or(false);
  };

  if (handlesToReport.isArray() && handlesToReport.size() > 0) {
    for (const auto& item : handlesToReport) {
      if (const auto handle = item.value.string()) visit(*handle);
    }
  } else {
    for (const std::string_view handle : entryOrder) visit(handle);
  }

  if (log.isEnabled(platform::LogLevel::Default)) {
    resultDescription_ = platform::FormatArg::describeArray(found);
    log.notice("location result: %@", *resultDescription_);
  }
  return found;
}

}  // namespace kyn
