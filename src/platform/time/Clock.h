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

class SystemClock final : public Clock {
 public:
  [[nodiscard]] Date now() const override;
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

/// ICU's calendar for the default locale, in the process's time zone or in the one named.
class IcuCalendar final : public Calendar {
 public:
  explicit IcuCalendar(std::optional<std::string> timeZoneId = std::nullopt);
  ~IcuCalendar() override;
  HourMinuteSecond hourMinuteSecond(Date date) const override;
  Date adding(Date date, int hours, int minutes, int seconds) const override;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace kyn::platform
