#include "platform/time/Clock.h"
#include "platform/time/SystemTime.h"

#include <unicode/calendar.h>
#include <unicode/timezone.h>

#include <chrono>
#include <cmath>

namespace kyn::platform {

Date SystemClock::now() const {
  const auto since1970 = std::chrono::system_clock::now().time_since_epoch();
  return std::chrono::duration<double>(since1970).count() - kReferenceDateSince1970;
}

struct IcuCalendar::Impl {
  mutable std::mutex mutex;  // an ICU calendar is not safe for concurrent use
  std::unique_ptr<icu::Calendar> calendar;
};

namespace {

UDate toUDate(Date date) { return (date + kReferenceDateSince1970) * 1000.0; }
Date fromUDate(UDate millis) { return millis / 1000.0 - kReferenceDateSince1970; }

}  // namespace

IcuCalendar::IcuCalendar(std::optional<std::string> timeZoneId) : impl_(std::make_unique<Impl>()) {
  UErrorCode status = U_ZERO_ERROR;
  if (timeZoneId) {
    icu::TimeZone* zone = icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(*timeZoneId));
    impl_->calendar.reset(icu::Calendar::createInstance(zone, status));  // adopts the zone
  } else {
    impl_->calendar.reset(icu::Calendar::createInstance(status));
  }
  if (U_FAILURE(status)) impl_->calendar.reset();
}

IcuCalendar::~IcuCalendar() = default;

HourMinuteSecond IcuCalendar::hourMinuteSecond(Date date) const {
  if (!impl_->calendar || !std::isfinite(date)) return {};
  std::lock_guard lock(impl_->mutex);
  UErrorCode status = U_ZERO_ERROR;
  icu::Calendar& cal = *impl_->calendar;
  cal.setTime(toUDate(date), status);
  HourMinuteSecond hms{cal.get(UCAL_HOUR_OF_DAY, status), cal.get(UCAL_MINUTE, status), cal.get(UCAL_SECOND, status)};
  if (U_FAILURE(status)) return {};
  return hms;
}

Date IcuCalendar::adding(Date date, int hours, int minutes, int seconds) const {
  if (!impl_->calendar || !std::isfinite(date)) return date;
  std::lock_guard lock(impl_->mutex);
  UErrorCode status = U_ZERO_ERROR;
  icu::Calendar& cal = *impl_->calendar;
  cal.setTime(toUDate(date), status);
  cal.add(UCAL_HOUR_OF_DAY, hours, status);
  cal.add(UCAL_MINUTE, minutes, status);
  cal.add(UCAL_SECOND, seconds, status);
  const UDate result = cal.getTime(status);
  if (U_FAILURE(status)) return date;
  return fromUDate(result);
}

}  // namespace kyn::platform
