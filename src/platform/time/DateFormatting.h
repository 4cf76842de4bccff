#pragma once

#include "platform/time/Clock.h"

#include <memory>
#include <optional>
#include <string>

namespace kyn::platform {

/// Dates as a person reads them, in one locale and time zone.
class DateFormatting {
 public:
  virtual ~DateFormatting() = default;
  /// The time of day in the short style ("3:30 PM", "15:30").
  [[nodiscard]] virtual std::string shortTime(Date date) const = 0;
  /// Date and time in the short styles ("11/21/26, 3:30 PM", "21.11.26, 15:30").
  [[nodiscard]] virtual std::string shortDateTime(Date date) const = 0;
};

}  // namespace kyn::platform
