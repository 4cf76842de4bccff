#include "commands/GetLocationsCmd.h"

#include "account/Common.h"
#include "model/KYNAXLocation.h"
#include "platform/Services.h"
#include "utils/KYNAXUtils.h"

#include <unordered_map>

namespace kyn {

using platform::member;
using platform::services;

std::string GetLocationsCmd::path() const { return std::string(KYNUrlBase) + "getlocations"; }

std::optional<std::vector<std::string>> GetLocationsCmd::allFriendsHandles() const {
  if (!friends) return std::nullopt;
  std::vector<std::string> handles;
  Common& common = Common::sharedInstance();
  for (const auto& person : *friends) {
    if (!person) continue;
    auto own = common.handlesForAXPerson(*person);
    handles.insert(handles.end(), std::make_move_iterator(own.begin()), std::make_move_iterator(own.end()));
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

Value GetLocationsCmd::jsonBodyDictionary() const {
  Value body = KYNBaseCmd::jsonBodyDictionary();
  if (auto handles = allFriendsHandles()) body["handles"] = std::move(*handles);
  if (auto here = currentLocationDictionary()) body["myLocation"] = std::move(*here);
  if (auto there = requestedLocationDictionary()) body["requestedLocation"] = std::move(*there);
  if (requestedLocationLabel) body["label"] = *requestedLocationLabel;
  if (proximity) body["proximity"] = *proximity;
  if (clientId) body["serverContext"] = Value{{"clientId", *clientId}};
  return body;
}

AXArray<AXKynLocation> GetLocationsCmd::result() {
  auto& log = services().log();
  const Value* response = jsonResponseDictionary();
  log.notice("getlocations_resultDictionary_raw: %@", response);

  const Value* locations = member(response, "locations");
  if (locations != nullptr && !locations->is_object()) locations = nullptr;  // null or the wrong type
  const Value* handlesToReport = member(response, "emails");
  const bool incomplete = platform::int32Value(statusCodeValue()) == 416;
  if (response == nullptr) return std::nullopt;

  std::vector<std::shared_ptr<AXKynLocation>> found;

  std::optional<Value> context;
  if (const Value* serverContext = member(response, "serverContext"); serverContext && serverContext->is_object()) {
    context = *serverContext;
    if (incomplete) (*context)["incomplete"] = true;
  }
  log.notice("serverContextDictionary: %@", context ? &*context : nullptr);
  setContextIdentifierURL(KYNAXUtils::contextIdentifierURLForDictionary(context ? &*context : nullptr));

  // Each handle is looked up once: index the entries and the friends first, so that the walk stays
  // linear in the number of friends (an ordered object searches its members one by one).
  std::unordered_map<std::string_view, const Value*> entries;
  if (locations != nullptr) {
    entries.reserve(locations->size());
    for (const auto& [handle, entry] : locations->items()) entries.emplace(handle, &entry);
  }
  std::unordered_map<std::string_view, std::shared_ptr<AXPerson>> personForHandle;
  if (friends) {
    for (const auto& person : *friends) {
      if (!person) continue;
      // The first friend that holds a handle, as e-mail address or as phone number, wins.
      if (person->emails) {
        for (const auto& e : *person->emails) {
          if (e && e->emailAddress) personForHandle.emplace(*e->emailAddress, person);
        }
      }
      if (person->phones) {
        for (const auto& p : *person->phones) {
          if (p && p->number) personForHandle.emplace(*p->number, person);
        }
      }
    }
  }

  auto visit = [&](const std::string& handle) {
    const auto entryIt = entries.find(handle);
    const Value* entry = entryIt == entries.end() ? nullptr : entryIt->second;
    if (platform::integerValue(member(entry, "status")) == 411) return;  // not a friend: left out
    const auto personIt = personForHandle.find(handle);
    auto person = personIt == personForHandle.end() ? nullptr : personIt->second;
    auto record = KYNAXLocation::locationWithHandle(handle, std::move(person), entry);
    if (record->avixLocation) found.push_back(record->avixLocation);
    atRequestedLocation = platform::boolValue(member(entry, "match")).value_or(false);
  };

  if (handlesToReport != nullptr && handlesToReport->is_array() && !handlesToReport->empty()) {
    for (const Value& handle : *handlesToReport) {
      if (handle.is_string()) visit(handle.get_ref<const std::string&>());
    }
  } else if (locations != nullptr) {
    for (const auto& [handle, _] : locations->items()) visit(handle);
  }

  log.notice("location result: %@", found);
  return found;
}

}  // namespace kyn
