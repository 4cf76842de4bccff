#pragma once

#include "platform/assistant/Model.h"
#include "platform/location/Location.h"
#include "platform/value/Value.h"

#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace kyn {

/// Keys of the age-string dictionary.
inline constexpr std::string_view LabelStringKey = "LabelStringKey";
inline constexpr std::string_view LabelAccessibilityStringKey = "LabelAccessibilityStringKey";

/// Prefix of every context identifier URL.
inline constexpr std::string_view kContextURLPrefix = "kynServerContext://serverContext?";

/// Stateless utilities: time units and age strings, the context identifier URL, and conversions
/// between assistant locations, platform locations and the server's location dictionary.
class KYNAXUtils {
 public:
  KYNAXUtils() = delete;

  // ---- Time ----

  /// Milliseconds since 1970 to seconds since 2001; nothing for nothing.
  [[nodiscard]] static std::optional<double> timeIntervalForMillisecondsSince1970(std::optional<double> milliseconds);
  /// Seconds since 2001 to milliseconds since 1970; nothing for nothing.
  [[nodiscard]] static std::optional<double> millisecondsSince1970ForTimeInterval(std::optional<double> interval);
  /// The start of the current day in the user's calendar (keeps the current sub-second fraction).
  [[nodiscard]] static platform::Date todayAtMidnight();
  /// `todayAtMidnight` less 86,400 seconds.
  [[nodiscard]] static platform::Date yesterdayAtMidnight();
  /// The display and spoken labels of a fix's age ("5 min ago"), under `LabelStringKey` and
  /// `LabelAccessibilityStringKey`. Nothing reads as now.
  [[nodiscard]] static Value dictionaryWithAgeStringsForDate(std::optional<platform::Date> date);

  // ---- Context identifier URL ----

  /// "kynServerContext://serverContext?" followed by "key=value&" for every entry but "authToken",
  /// both escaped. Nothing for no dictionary (or a value that is no JSON object).
  [[nodiscard]] static std::optional<std::string> contextIdentifierURLForDictionary(platform::JsonView dictionary);
  /// The same for a dictionary's members, in order and each key once (`platform::uniqueMembers`).
  [[nodiscard]] static std::string contextIdentifierURLForMembers(std::span<const platform::JsonEntry> members);
  /// The way back: numeric values become 32-bit integers, other values strings. Malformed pairs are
  /// skipped; never fails.
  [[nodiscard]] static Value contextDictionaryForURL(std::string_view url);

  // ---- Locations ----

  /// A platform location for an assistant location, stamped now; nothing when its latitude or its
  /// longitude is absent or exactly 0.
  [[nodiscard]] static std::shared_ptr<const platform::Location> coreLocationForAXLocation(
      const std::shared_ptr<AXLocation>& location);
  /// The server's location dictionary for a platform location; nothing for an invalid coordinate.
  [[nodiscard]] static std::optional<Value> dictionaryForLocation(const platform::Location& location);
  [[nodiscard]] static std::optional<Value> dictionaryForLocation(const std::shared_ptr<const platform::Location>& location);
  /// Always true.
  [[nodiscard]] static bool isKYNAppInstalled() noexcept { return true; }

  /// A double truncated toward zero to 32 bits; NaN, infinities and values outside the range give
  /// the most negative value (as the processor's conversion does).
  [[nodiscard]] static std::int32_t truncateToInt32(double value) noexcept;
};

}  // namespace kyn
