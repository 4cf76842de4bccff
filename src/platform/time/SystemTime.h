#pragma once

// The system's clock and ICU's calendar.

#include "platform/time/Clock.h"

#include <memory>
#include <optional>
#include <string>

namespace kyn::platform {

class SystemClock final : public Clock {
 public:
  [[nodiscard]] Date now() const override;
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
