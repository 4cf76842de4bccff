// The distance calculator: GeographicLib's geodesic on the WGS84 ellipsoid for the metres, ICU's
// number formatter with its road-distance unit preferences (CLDR) for the units, rounding and words.
#include "platform/location/DistanceCalculator.h"

#include "platform/Services.h"
#include "platform/log/Format.h"

#include <GeographicLib/Geodesic.hpp>
#include <unicode/locid.h>
#include <unicode/numberformatter.h>
#include <unicode/ulocdata.h>

#include <array>
#include <cmath>
#include <limits>
#include <mutex>

namespace kyn::platform {
namespace {

constexpr std::string_view kPhraseKey = "DISTANCE_AWAY";

/// A unit system the user may choose, and a region that ICU's unit preferences read as it.
struct UnitSystem {
  std::string_view value;
  long code;
  const char* regionKeyword;  // the "rg" keyword: a region code followed by "zzzz"
};

constexpr std::array<UnitSystem, 3> kUnitSystems{{
    {kMeasurementSystemMetricValue, kMeasurementSystemMetric, "001zzzz"},
    {kMeasurementSystemUSValue, kMeasurementSystemUS, "uszzzz"},
    {kMeasurementSystemUKValue, kMeasurementSystemUK, "gbzzzz"},
}};

/// The unit system that the preferences domain names, if it names a valid one.
const UnitSystem* preferredUnitSystem(std::string_view suiteName) {
  const auto stored = services().preferences.get()->value(suiteName, kMeasurementSystemKey);
  if (!stored) return nullptr;
  const auto text = stringValue(&*stored);
  for (const auto& system : kUnitSystems) {
    if (text && *text == system.value) return &system;
  }
  Log::shared().error("Preference %@ of %@ is %@, not metric, us or uk; the region's units apply",
                      kMeasurementSystemKey, suiteName, *stored);
  return nullptr;
}

class GeodesicDistanceCalculator final : public KYDistanceCalculator {
 public:
  GeodesicDistanceCalculator(std::string language, const icu::Locale& units, long system)
      : language_(std::move(language)),
        system_(system),
        formatter_(icu::number::NumberFormatter::withLocale(units)
                       .unit(icu::MeasureUnit::getMeter())
                       .usage("road")
                       .unitWidth(UNUM_UNIT_WIDTH_SHORT)) {}

  void setLocalizationDelegate(std::shared_ptr<const KYLocalization> delegate) override {
    std::lock_guard lock(mutex_);
    delegate_ = std::move(delegate);
  }

  std::optional<std::string> localizedDistanceFromLocation(const Location& from, const Location& to) const override {
    const double metres = geodesicDistance(from.coordinate, to.coordinate);
    if (!std::isfinite(metres)) return std::nullopt;
    // The road-distance preferences pick the unit and the rounding: "350 m", "1.2 km", "500 ft".
    UErrorCode status = U_ZERO_ERROR;
    const icu::UnicodeString text = formatter_.formatDouble(metres, status).toString(status);
    if (U_FAILURE(status)) return std::nullopt;
    std::string measure;
    text.toUTF8String(measure);

    std::shared_ptr<const KYLocalization> delegate;
    {
      std::lock_guard lock(mutex_);
      delegate = delegate_;
    }
    if (!delegate) return measure;
    const std::string phrase = delegate->localizedStringForKey(kPhraseKey, "", "", language_);
    if (phrase == kPhraseKey) return measure;
    return format(phrase, measure);
  }

  long measurementSystem() const override { return system_; }

 private:
  std::string language_;
  long system_;
  icu::number::LocalizedNumberFormatter formatter_;  // immutable, safe for concurrent use
  mutable std::mutex mutex_;
  std::shared_ptr<const KYLocalization> delegate_;
};

}  // namespace

double geodesicDistance(Coordinate from, Coordinate to) {
  double metres = std::numeric_limits<double>::quiet_NaN();
  if (!isValidCoordinate(from) || !isValidCoordinate(to)) return metres;
  GeographicLib::Geodesic::WGS84().Inverse(from.latitude, from.longitude, to.latitude, to.longitude, metres);
  return metres;
}

std::shared_ptr<KYDistanceCalculator> KYDistanceCalculator::initWithDefaultsSuiteName(
    std::string_view suiteName, const std::optional<std::string>& locale, const std::string& measurementSystemLocale) {
  // The words' language with the conventions of the system's region; a locale without a region
  // takes its likeliest one ("en" is en_US), so that the units and the reported system agree.
  icu::Locale units(presentationLocaleId(locale, measurementSystemLocale).c_str());
  UErrorCode status = U_ZERO_ERROR;
  if (*units.getCountry() == '\0') units.addLikelySubtags(status);

  long system = kMeasurementSystemMetric;
  if (const UnitSystem* preferred = preferredUnitSystem(suiteName)) {
    system = preferred->code;
    status = U_ZERO_ERROR;
    units.setKeywordValue("rg", preferred->regionKeyword, status);
  } else {
    status = U_ZERO_ERROR;
    const UMeasurementSystem regional = ulocdata_getMeasurementSystem(units.getName(), &status);
    if (U_SUCCESS(status)) system = static_cast<long>(regional);
  }
  std::string language = locale && !locale->empty() ? *locale : measurementSystemLocale;
  return std::make_shared<GeodesicDistanceCalculator>(std::move(language), units, system);
}

}  // namespace kyn::platform
