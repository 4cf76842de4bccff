#include "utils/KYNAXUtils.h"

#include "platform/Services.h"
#include "platform/text/StringEscapes.h"
#include "platform/value/Json.h"

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>

namespace kyn {

using platform::Date;
using platform::kReferenceDateSince1970;
using platform::services;

// ---- Time ----

std::optional<double> KYNAXUtils::timeIntervalForMillisecondsSince1970(std::optional<double> milliseconds) {
  if (!milliseconds) return std::nullopt;
  return *milliseconds / 1000.0 - kReferenceDateSince1970;
}

std::optional<double> KYNAXUtils::millisecondsSince1970ForTimeInterval(std::optional<double> interval) {
  if (!interval) return std::nullopt;
  return (*interval + kReferenceDateSince1970) * 1000.0;
}

Date KYNAXUtils::todayAtMidnight() {
  auto clock = services().clock.get();
  auto calendar = services().calendar.get();
  const auto hms = calendar->hourMinuteSecond(clock->now());
  // The components are taken off a second reading of the clock, so the result keeps that reading's
  // sub-second fraction; callers only compare against it.
  return calendar->adding(clock->now(), -hms.hour, -hms.minute, -hms.second);
}

Date KYNAXUtils::yesterdayAtMidnight() { return todayAtMidnight() - 86'400.0; }

std::int32_t KYNAXUtils::truncateToInt32(double value) noexcept {
  constexpr double kLimit = 2147483648.0;  // 2^31
  if (!(value > -kLimit - 1.0 && value < kLimit)) return std::numeric_limits<std::int32_t>::min();
  return static_cast<std::int32_t>(value);
}

Value KYNAXUtils::dictionaryWithAgeStringsForDate(std::optional<Date> date) {
  const double interval = date ? *date - services().clock.get()->now() : 0.0;
  const std::int32_t seconds = truncateToInt32(interval);
  // A future date counts like a past one. The most negative value has no positive counterpart and
  // stays negative, which lands in the now band.
  const std::int32_t age = seconds == std::numeric_limits<std::int32_t>::min() ? seconds : std::abs(seconds);
  const double minutes = age / 60.0;

  const char* displayKey;
  const char* accessibilityKey;
  std::optional<std::uint64_t> number;
  if (minutes <= 0.5) {
    displayKey = "LOCATED_NOW";
    accessibilityKey = "ACCESSIBILITY_LOCATED_NOW";
  } else if (minutes < 1.0) {
    displayKey = "LOCATED_LESS_THAN_30SECONDS";
    accessibilityKey = "ACCESSIBILITY_LOCATED_LESS_THAN_30SECONDS";
    number = 30;
  } else if (minutes < 60.0) {
    const auto n = static_cast<std::uint64_t>(std::floor(minutes));
    displayKey = "LOCATED_MINUTES";
    accessibilityKey = n == 1 ? "ACCESSIBILITY_LOCATED_MINUTE" : "ACCESSIBILITY_LOCATED_MINUTES";
    number = n;
  } else if (minutes < 120.0) {
    displayKey = "LOCATED_LESS_THAN_1HR";
    accessibilityKey = "ACCESSIBILITY_LOCATED_LESS_THAN_1HR";
    number = 1;
  } else {
    displayKey = "LOCATED_MORE_THAN_1HR";
    accessibilityKey = "ACCESSIBILITY_LOCATED_MORE_THAN_1HR";
    number = static_cast<std::uint64_t>(std::floor(minutes / 60.0));
  }

  std::string display = platform::avixUILocalizedStringForKey(displayKey);
  std::string spoken = platform::avixUILocalizedStringForKey(accessibilityKey);
  if (number) {
    // Every band but "now" puts the number, as plain text in the user's locale, into its one %@.
    const std::string text = services().numberFormatting.get()->integerText(*number);
    display = platform::format(display, text);
    spoken = platform::format(spoken, text);
  }
  Value result = Value::object();
  result[std::string(LabelStringKey)] = std::move(display);
  result[std::string(LabelAccessibilityStringKey)] = std::move(spoken);
  return result;
}

// ---- Context identifier URL ----

namespace {

// The textual description of a context value that is not a string.
std::string describe(platform::JsonView value) {
  if (value.isBool()) return *platform::boolValue(value) ? "1" : "0";
  if (value.isNumber() && !value.isInteger()) return platform::numberDescription(*platform::numberValue(value));
  if (value.isNull()) return "<null>";
  return platform::toJson(value);  // integers, arrays and objects
}

}  // namespace

std::optional<std::string> KYNAXUtils::contextIdentifierURLForDictionary(platform::JsonView dictionary) {
  if (!dictionary.isObject()) return std::nullopt;
  return contextIdentifierURLForMembers(platform::uniqueMembers(dictionary));
}

std::string KYNAXUtils::contextIdentifierURLForMembers(std::span<const platform::JsonEntry> members) {
  std::string url(kContextURLPrefix);
  for (const auto& [key, value] : members) {
    if (key == "authToken") continue;  // the token never goes into the URL
    platform::appendPercentEscaped(url, key);
    url += '=';
    if (const auto text = value.string()) platform::appendPercentEscaped(url, *text);
    else platform::appendPercentEscaped(url, describe(value));
    url += '&';
  }
  return url;
}

Value KYNAXUtils::contextDictionaryForURL(std::string_view url) {
  Value result = Value::object();
  if (url.size() <= kContextURLPrefix.size()) return result;
  std::string_view rest = url.substr(kContextURLPrefix.size());  // the prefix itself is not compared
  while (true) {
    const auto amp = rest.find('&');
    const std::string_view piece = rest.substr(0, amp);
    const auto eq = piece.find('=');
    if (eq != std::string_view::npos && piece.find('=', eq + 1) == std::string_view::npos) {
      auto key = platform::decodeFromPercentEscape(piece.substr(0, eq));
      auto value = platform::decodeFromPercentEscape(piece.substr(eq + 1));
      if (key && value) {
        if (platform::isNumeric(*value)) result[*key] = platform::leadingInteger32(*value);
        else result[*key] = std::move(*value);
      }
    }
    if (amp == std::string_view::npos) break;
    rest.remove_prefix(amp + 1);
  }
  return result;
}

// ---- Locations ----

std::shared_ptr<const platform::Location> KYNAXUtils::coreLocationForAXLocation(const std::shared_ptr<AXLocation>& location) {
  if (!location) return nullptr;
  const double latitude = location->latitude.value_or(0.0);
  if (latitude == 0.0) return nullptr;
  const double longitude = location->longitude.value_or(0.0);
  if (longitude == 0.0) return nullptr;
  auto result = std::make_shared<platform::Location>();
  result->coordinate = {latitude, longitude};
  result->horizontalAccuracy = location->accuracy.value_or(0.0);
  result->timestamp = services().clock.get()->now();
  return result;
}

std::optional<Value> KYNAXUtils::dictionaryForLocation(const platform::Location& location) {
  if (!platform::isValidCoordinate(location.coordinate)) return std::nullopt;
  Value dictionary = Value::object();
  dictionary["latitude"] = location.coordinate.latitude;
  dictionary["longitude"] = location.coordinate.longitude;
  dictionary["source"] = "assistant";
  // Only the lowest 8 bits of the whole metres decide whether the accuracy is sent.
  const auto wholeMetres = static_cast<std::uint32_t>(truncateToInt32(location.horizontalAccuracy));
  if ((wholeMetres & 0xFFu) != 0) dictionary["horizontalAccuracy"] = location.horizontalAccuracy;
  if (location.timestamp && *location.timestamp != 0.0) {
    const auto ms = millisecondsSince1970ForTimeInterval(*location.timestamp);
    if (ms && std::isfinite(*ms)) dictionary["timestamp"] = *ms;
  }
  return dictionary;
}

std::optional<Value> KYNAXUtils::dictionaryForLocation(const std::shared_ptr<const platform::Location>& location) {
  if (!location) return std::nullopt;
  return dictionaryForLocation(*location);
}

}  // namespace kyn
