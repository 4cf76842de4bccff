#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace kyn::platform {

/// A date inside the system: seconds since 1 January 2001 00:00:00 UTC.
using Date = double;

/// Seconds from 1 January 1970 00:00:00 UTC to the reference date 1 January 2001.
inline constexpr double kReferenceDateSince1970 = 978'307'200.0;

class Clock {
 public:
  virtual ~Clock() = default;
  [[nodiscard]] virtual Date now() const = 0;
};

struct HourMinuteSecond {
  int hour = 0;
  int minute = 0;
  int second = 0;
};

/// The user's calendar and time zone.
class Calendar {
 public:
  virtual ~Calendar() = default;
  /// Hour (0-23), minute and second of `date` in the calendar's time zone.
  [[nodiscard]] virtual HourMinuteSecond hourMinuteSecond(Date date) const = 0;
  /// `date` moved by the given calendar components (hours, then minutes, then seconds).
  [[nodiscard]] virtual Date adding(Date date, int hours, int minutes, int seconds) const = 0;
};

}  // namespace kyn::platform
