#pragma once

#include "sim/Geo.h"
#include "sim/Json.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::sim {

/// One friend of the signed-in user as the data set describes them.
struct Friend {
  std::string handle;              ///< e-mail address as written, or a phone number in E.164 form
  bool pending = false;            ///< has not answered yet: the server answers "location": null
  std::optional<Json> location;    ///< the location dictionary of the answer, without "timestamp"
  std::optional<Coordinate> coordinate;       ///< "latitude"/"longitude" of `location`
  std::optional<std::int64_t> ageSeconds;     ///< the fix is this old at the time of each request
  std::optional<std::int64_t> timestampMs;    ///< or this fixed time, ms since 1970
};

/// The world the simulator serves: the user's friends (in document order) and the server context.
struct DataSet {
  std::vector<Friend> friends;
  Json serverContext = Json{{"minCallbackIntervalInMS", 5000}};

  /// The friend with this handle: e-mail addresses compare without regard to case, phone numbers
  /// exactly. Nothing when the handle is not a friend's.
  [[nodiscard]] const Friend* findFriend(std::string_view handle) const;
};

/// Parses and checks a data set; throws std::invalid_argument with a message that says which
/// member is wrong and why.
[[nodiscard]] DataSet parseDataSet(std::string_view text);

/// Whether a handle is an e-mail address (it contains "@").
[[nodiscard]] bool isEmailHandle(std::string_view handle) noexcept;

/// Whether a text is a phone number in E.164 form: "+", a non-zero digit, at most 15 digits in all.
[[nodiscard]] bool isE164(std::string_view text) noexcept;

}  // namespace kyn::sim
