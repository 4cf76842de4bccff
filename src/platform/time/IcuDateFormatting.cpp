#include "platform/time/DateFormatting.h"
#include "platform/time/IcuDateFormatting.h"

#include <unicode/datefmt.h>
#include <unicode/timezone.h>

#include <cmath>
#include <mutex>

namespace kyn::platform {

struct IcuDateFormatting::Impl {
  std::mutex mutex;  // formatting moves the format's calendar: not safe for concurrent use
  std::unique_ptr<icu::DateFormat> time;
  std::unique_ptr<icu::DateFormat> dateTime;

  std::string format(icu::DateFormat* formatter, Date date) {
    if (formatter == nullptr || !std::isfinite(date)) return {};
    icu::UnicodeString text;
    {
      std::lock_guard lock(mutex);
      formatter->format((date + kReferenceDateSince1970) * 1000.0, text);
    }
    std::string out;
    text.toUTF8String(out);
    return out;
  }
};

IcuDateFormatting::IcuDateFormatting(const std::string& localeId, const std::optional<std::string>& timeZoneId)
    : impl_(std::make_unique<Impl>()) {
  const icu::Locale locale(localeId.c_str());
  impl_->time.reset(icu::DateFormat::createTimeInstance(icu::DateFormat::kShort, locale));
  impl_->dateTime.reset(icu::DateFormat::createDateTimeInstance(icu::DateFormat::kShort, icu::DateFormat::kShort, locale));
  if (timeZoneId) {
    const auto zone = icu::UnicodeString::fromUTF8(*timeZoneId);
    if (impl_->time) impl_->time->adoptTimeZone(icu::TimeZone::createTimeZone(zone));
    if (impl_->dateTime) impl_->dateTime->adoptTimeZone(icu::TimeZone::createTimeZone(zone));
  }
}

IcuDateFormatting::~IcuDateFormatting() = default;

std::string IcuDateFormatting::shortTime(Date date) const { return impl_->format(impl_->time.get(), date); }

std::string IcuDateFormatting::shortDateTime(Date date) const { return impl_->format(impl_->dateTime.get(), date); }

}  // namespace kyn::platform
