#pragma once

#include "platform/time/Clock.h"

#include <optional>

namespace kyn::platform {

struct Coordinate {
  double latitude = 0.0;   // degrees
  double longitude = 0.0;  // degrees
};

/// A coordinate is valid when its latitude lies in [-90, 90] and its longitude in [-180, 180];
/// NaN is never valid.
[[nodiscard]] constexpr bool isValidCoordinate(Coordinate c) noexcept {
  return c.latitude >= -90.0 && c.latitude <= 90.0 && c.longitude >= -180.0 && c.longitude <= 180.0;
}

/// A platform location: a fix with its accuracy and time. Immutable once made; shared by pointer.
struct Location {
  Coordinate coordinate;
  double altitude = 0.0;            // metres
  double horizontalAccuracy = 0.0;  // metres; negative marks an invalid accuracy
  double verticalAccuracy = 0.0;    // metres
  double course = 0.0;              // degrees
  double speed = 0.0;               // metres per second
  std::optional<Date> timestamp;    // when the fix was taken
};

}  // namespace kyn::platform
