#pragma once

#include "sim/Geo.h"
#include "sim/Json.h"

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::sim {

/// Where someone was last located, as the data set or a move gives it.
struct Whereabouts {
  std::optional<Json> location;               ///< the location dictionary of answers, without "timestamp"
  std::optional<Coordinate> coordinate;       ///< "latitude"/"longitude" of `location`
  std::optional<std::int64_t> ageSeconds;     ///< the fix is this old at the time of each request
  std::optional<std::int64_t> timestampMs;    ///< or this fixed time, ms since 1970
};

/// One friend as a signed-in account sees them.
struct Friend {
  std::string handle;        ///< e-mail address as written, or a phone number in E.164 form
  bool pending = false;      ///< has not answered yet: the server answers "location": null
  Whereabouts whereabouts;   ///< empty while the friend hides their location
};

/// A place: a coordinate and what is known of its address, as the members of a "fullAddress"
/// ("streetAddress", "streetName", "locality", "stateCode", "country").
struct Place {
  std::string label;                ///< the account's name for it ("Work"); empty in the gazetteer
  Coordinate coordinate;
  std::optional<double> radius;     ///< metres; a fence's default when absent
  Json address = Json::object();
};

/// A friendship as the data set declares it: the friend's whereabouts live with the person.
struct Friendship {
  std::string handle;
  bool pending = false;
};

/// A signed-in account: its holder, whether the holder hides their location, friends and places.
struct Account {
  std::string personId;   ///< empty for the account of --person until the command line names it
  std::string handle;     ///< the holder's own handle; empty when the data set gives none
  bool hidden = false;
  std::vector<Friendship> friends;
  std::vector<Place> places;
};

/// What one account sees: its friends in data-set order and the server context.
struct AccountView {
  std::vector<Friend> friends;
  Json serverContext;

  /// The friend with this handle: e-mail addresses compare without regard to case, phone numbers
  /// exactly. Nothing when the handle is not a friend's.
  [[nodiscard]] const Friend* findFriend(std::string_view handle) const;
};

/// The world the simulator starts from: the accounts (the account of --person first, then the
/// further accounts in document order), everyone's whereabouts, the gazetteer of addresses and the
/// server context.
struct DataSet {
  std::vector<Account> accounts = std::vector<Account>(1);
  std::map<std::string, Whereabouts, std::less<>> people;  ///< by `handleKey`
  std::vector<Place> gazetteer;
  Json serverContext = Json{{"minCallbackIntervalInMS", 5000}};

  /// The whereabouts of the person with this handle; nothing when nobody gave them.
  [[nodiscard]] const Whereabouts* whereabouts(std::string_view handle) const;
  /// The account whose holder has this handle, or nothing.
  [[nodiscard]] const Account* holder(std::string_view handle) const;
  /// The whereabouts others may see: none when nobody gave them or their holder hides.
  [[nodiscard]] const Whereabouts* shownWhereabouts(std::string_view handle) const;
  /// What `account` sees: its friends with their whereabouts, none for a friend who hides.
  [[nodiscard]] AccountView view(std::size_t account) const;
};

/// Parses and checks a data set; throws std::invalid_argument with a message that says which
/// member is wrong and why.
[[nodiscard]] DataSet parseDataSet(std::string_view text);

/// Whether a handle is an e-mail address (it contains "@").
[[nodiscard]] bool isEmailHandle(std::string_view handle) noexcept;

/// Whether a text is a phone number in E.164 form: "+", a non-zero digit, at most 15 digits in all.
[[nodiscard]] bool isE164(std::string_view text) noexcept;

/// The form under which handles are compared: e-mail addresses in lower case, phone numbers as they are.
[[nodiscard]] std::string handleKey(std::string_view handle);

/// Whether two texts are equal when ASCII case is ignored.
[[nodiscard]] bool equalsIgnoringCase(std::string_view a, std::string_view b) noexcept;

}  // namespace kyn::sim
