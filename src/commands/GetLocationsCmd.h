#pragma once

#include "commands/KYNBaseCmd.h"
#include "platform/assistant/Model.h"
#include "platform/location/Location.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kyn {

/// The request behind "where are my friends": the friends' handles, the user's position, the place
/// asked about and a proximity word go out; the friends' locations, whether they are at the place,
/// and the server's context come back.
class GetLocationsCmd : public KYNBaseCmd {
 public:
  [[nodiscard]] std::string path() const override;
  /// "clientContext", then "handles", "myLocation", "requestedLocation", "label", "proximity" and
  /// "serverContext" (with "clientId"), each only when it has a value.
  [[nodiscard]] Value jsonBodyDictionary() const override;
  /// The same members written as text, without making the dictionary.
  [[nodiscard]] std::string jsonBody() const override;

  /// The friends' assistant locations, decoded from the response; nothing without a response. Sets
  /// `atRequestedLocation` (the "match" of the last entry not skipped) and `contextIdentifierURL`.
  /// Work is linear in the number of entries.
  [[nodiscard]] AXArray<AXKynLocation> result();
  /// The text in which the last `result()` logged the locations it returned, when it made that log
  /// line; taken out. The caller that logs the same records next takes it rather than describing
  /// them again, which is the larger part of what a search's log lines cost.
  [[nodiscard]] std::optional<std::string> takeResultDescription() noexcept { return std::exchange(resultDescription_, {}); }

  /// Every friend's handles, friend after friend (phones, then e-mails); nothing without friends.
  [[nodiscard]] std::optional<std::vector<std::string>> allFriendsHandles() const;
  /// The first friend with an e-mail address or a phone number exactly equal to `handle`.
  [[nodiscard]] std::shared_ptr<AXPerson> friendForHandle(std::string_view handle) const;
  [[nodiscard]] std::optional<Value> currentLocationDictionary() const;
  [[nodiscard]] std::optional<Value> requestedLocationDictionary() const;

  [[nodiscard]] std::string_view commandName() const override { return "GetLocationsCmd"; }

  // Properties. Arrays and strings are copied on assignment; locations are immutable and shared.
  AXArray<AXPerson> friends;
  std::optional<std::vector<std::string>> emails;  // carried, never sent
  std::optional<std::string> proximity;
  std::shared_ptr<const platform::Location> currentLocation;
  std::shared_ptr<const platform::Location> requestedLocation;
  std::optional<std::string> requestedLocationLabel;
  std::optional<bool> atRequestedLocation;
  std::optional<std::string> clientId;

 private:
  /// Hands each member that follows the base's to `sink(key, value)`, in order.
  template <class Sink>
  void bodyMembers(Sink&& sink) const;

  std::optional<std::string> resultDescription_;
};

}  // namespace kyn
