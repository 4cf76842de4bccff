#pragma once

#include "platform/localization/LocalizationDelegate.h"
#include "platform/location/Location.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// Codes of `KYDistanceCalculator::measurementSystem` (ICU's UMeasurementSystem values).
inline constexpr long kMeasurementSystemMetric = 0;
inline constexpr long kMeasurementSystemUS = 1;
inline constexpr long kMeasurementSystemUK = 2;

/// The key in the calculator's preferences domain that overrides the region's unit system, and its
/// values.
inline constexpr std::string_view kMeasurementSystemKey = "MeasurementSystem";
inline constexpr std::string_view kMeasurementSystemMetricValue = "metric";
inline constexpr std::string_view kMeasurementSystemUSValue = "us";
inline constexpr std::string_view kMeasurementSystemUKValue = "uk";

/// Tells how far apart two locations are, in words and units a person uses: the distance along the
/// WGS84 ellipsoid, rounded as a road distance is said in the unit system of a region (metres and
/// kilometres; feet and miles; yards and miles). Thread-safe once the delegate is set.
class KYDistanceCalculator {
 public:
  virtual ~KYDistanceCalculator() = default;

  /// A calculator that reads its settings from the preferences domain `suiteName`, words distances
  /// in `locale` (a language tag or ICU id; nothing: the measurement locale's language) and takes the
  /// unit system from the region of `measurementSystemLocale` unless the domain's
  /// `kMeasurementSystemKey` names another. Settings are read once, here.
  [[nodiscard]] static std::shared_ptr<KYDistanceCalculator> initWithDefaultsSuiteName(
      std::string_view suiteName, const std::optional<std::string>& locale, const std::string& measurementSystemLocale);

  /// Where the calculator finds its phrase around a distance ("DISTANCE_AWAY", a format with one
  /// `%@`, in the words' language). Without a delegate the distance stands alone ("350 m").
  virtual void setLocalizationDelegate(std::shared_ptr<const KYLocalization> delegate) = 0;
  /// The distance from `from` to `to` in words; nothing when either coordinate is invalid.
  [[nodiscard]] virtual std::optional<std::string> localizedDistanceFromLocation(const Location& from,
                                                                                 const Location& to) const = 0;
  /// The unit system in use: `kMeasurementSystemMetric`, `kMeasurementSystemUS` or `kMeasurementSystemUK`.
  [[nodiscard]] virtual long measurementSystem() const = 0;
};

/// Metres between two coordinates along the WGS84 ellipsoid (the geodesic inverse problem); NaN for
/// an invalid coordinate.
[[nodiscard]] double geodesicDistance(Coordinate from, Coordinate to);

}  // namespace kyn::platform
