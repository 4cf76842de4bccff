#pragma once

#include "sim/DataSet.h"
#include "sim/Json.h"

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::sim {

/// Fence limits; a request that would break one fails with the code beside it.
inline constexpr std::size_t kMaxFencesPerAccount = 10;  ///< 541: fences switched on per account
inline constexpr std::size_t kMaxFencesPerFriend = 3;    ///< 542: fences switched on about one friend
inline constexpr double kMaxFenceRadius = 10'000.0;      ///< 543: metres; a vaguer place cannot be watched
// 544: an "immediate" fence that is not one-time (it answers "is the person there now?" once).
inline constexpr double kDefaultFenceRadius = 150.0;     ///< metres, when the place gives none

/// A set-geofence request, checked and decoded.
struct FenceRequest {
  std::vector<std::string> emails;        ///< the friend's handles
  std::optional<Coordinate> coordinate;   ///< of "requestedLocation"
  double accuracy = 0.0;                  ///< its "horizontalAccuracy"
  std::string label;
  std::string address;                    ///< the "address" text
  Json fullAddress = Json::object();
  bool on = true;
  std::string trigger;                    ///< "enter", "exit", "immediate", or "" (any, to switch off)
  bool oneTimeOnly = false;
  bool notifyMe = true;  ///< tell the account holder about the friend; else tell the friend about the holder
};

/// The outcome of a set-geofence request: the body's status code and, when a fence was set, the
/// fence and its address.
struct FenceAnswer {
  int status = 200;
  Json fence;        ///< null unless a fence was set
  Json fullAddress;  ///< null unless a fence was set
};

/// The live state of the service: everyone's whereabouts, who hides, and the accounts' fences,
/// which fire as people move. Thread-safe.
class World {
 public:
  /// Receives each notification a fence sends, in the order they fire.
  using Sink = std::function<void(const Json& notification)>;

  explicit World(DataSet data, Sink notify = {});

  /// Accounts in the data set's order; person ids never change.
  [[nodiscard]] std::size_t accounts() const noexcept { return data_.accounts.size(); }
  [[nodiscard]] const std::string& personId(std::size_t account) const { return data_.accounts.at(account).personId; }
  [[nodiscard]] const Json& serverContext() const noexcept { return data_.serverContext; }

  /// What `account` sees now.
  [[nodiscard]] AccountView view(std::size_t account) const;

  /// Hides or shows the holder's location from their friends; returns the holder's own record
  /// ("location", or null, and "preferredEmail"). Showing it again lets the holder's fences judge
  /// where they are now.
  Json setHidden(std::size_t account, bool hidden, std::int64_t nowMs);

  /// Sets, changes or switches off a fence of `account`.
  FenceAnswer setFence(std::size_t account, const FenceRequest& request, std::int64_t nowMs);

  /// Puts the person with `handle` at `to`, with the fix taken now, and lets every fence about
  /// them judge the move. Returns {"handle", "location", "notifications"}; nothing when nobody in
  /// the data set has the handle.
  std::optional<Json> move(std::string_view handle, Coordinate to, std::optional<double> accuracy,
                           std::int64_t nowMs);

 private:
  struct Fence {
    std::string id;
    std::size_t owner = 0;
    bool notifyMe = true;
    std::vector<std::string> friends;     ///< as the data set spells them
    std::vector<std::string> subjects;    ///< whose moves it watches
    std::vector<std::string> recipients;  ///< whom it tells
    Place place;
    double radius = kDefaultFenceRadius;
    std::string trigger;
    bool oneTimeOnly = false;
    bool on = true;
    std::map<std::string, bool, std::less<>> inside;  ///< last known, by handle key
  };
  struct Placed {
    std::optional<Place> place;
    int status = 0;  ///< why there is none
  };

  [[nodiscard]] std::vector<std::string> friendsNamed(const Account& account,
                                                      const std::vector<std::string>& handles) const;
  [[nodiscard]] Placed locate(std::size_t owner, const FenceRequest& request,
                              const std::vector<std::string>& subjects) const;
  [[nodiscard]] const Place* gazetteerEntry(const FenceRequest& request) const;
  [[nodiscard]] Json addressNear(Coordinate coordinate) const;
  /// Where `owner` may see the person: nowhere while they hide or have not answered the owner.
  [[nodiscard]] std::optional<Coordinate> seenBy(std::size_t owner, std::string_view handle) const;
  /// Judges where `subject` is against the fence; fires and returns the notification on a transition.
  void judge(Fence& fence, const std::string& subject, bool settingUp, std::int64_t nowMs, Json& fired);
  void judgeAll(std::string_view subject, std::int64_t nowMs, Json& fired);
  [[nodiscard]] Json describe(const Fence& fence) const;

  mutable std::mutex mutex_;
  DataSet data_;
  Sink notify_;
  std::vector<Fence> fences_;
  int fencesMade_ = 0;
};

}  // namespace kyn::sim
