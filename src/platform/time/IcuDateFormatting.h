#pragma once

#include "platform/time/DateFormatting.h"

#include <memory>
#include <optional>
#include <string>

namespace kyn::platform {

/// ICU's two short formats for a locale, in the process's time zone or in the one named, built once.
class IcuDateFormatting final : public DateFormatting {
 public:
  explicit IcuDateFormatting(const std::string& localeId, const std::optional<std::string>& timeZoneId = std::nullopt);
  ~IcuDateFormatting() override;
  std::string shortTime(Date date) const override;
  std::string shortDateTime(Date date) const override;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace kyn::platform
