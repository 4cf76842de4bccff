#include "platform/Services.h"
#include "platform/location/DistanceCalculator.h"
#include "support/PlatformTest.h"

#include <cmath>
#include <numbers>

namespace kyn::platform {
namespace {

constexpr std::string_view kSuite = "group.com.zanto.aerix.ky";

/// Two places on the equator `metres` apart (the equator is the geodesic between them).
std::pair<Location, Location> apart(double metres) {
  return {test::fix(0.0, 10.0), test::fix(0.0, 10.0 + metres / 6'378'137.0 * 180.0 / std::numbers::pi)};
}

using DistanceCalculatorTest = test::PlatformTest;

// Wellington to Salamanca, nearly antipodal: 19,959,679.267 m in GeographicLib's documentation.
TEST(GeodesicDistance, MatchesTheWGS84ReferenceValue) {
  EXPECT_NEAR(geodesicDistance({-41.32, 174.81}, {40.96, -5.50}), 19'959'679.267, 0.001);
  EXPECT_TRUE(std::isnan(geodesicDistance({91.0, 0.0}, {0.0, 0.0})));
}

TEST(PresentationLocale, TheAssistantsLanguageWithTheSystemsRegion) {
  EXPECT_EQ(presentationLocaleId("de", "en_US"), "de_US");
  EXPECT_EQ(presentationLocaleId("en-GB", "de_DE"), "en_DE");
  EXPECT_EQ(presentationLocaleId("zh-Hant", "zh_TW"), "zh_Hant_TW");
  EXPECT_EQ(presentationLocaleId("de-CH", "en"), "de_CH");  // the system names no region
  EXPECT_EQ(presentationLocaleId(std::nullopt, "fr_FR"), "fr_FR");
}

TEST_F(DistanceCalculatorTest, UnitsAndRoundingFollowTheRegionWordsTheLanguage) {
  const struct {
    const char* language;
    const char* system;
    double metres;
    const char* text;
    long measurementSystem;
  } cases[] = {
      {"en-US", "en_US", 350, "1,150 ft", kMeasurementSystemUS},
      {"en-US", "en_US", 1234.567, "0.77 mi", kMeasurementSystemUS},
      {"en-GB", "en_GB", 350, "400 yd", kMeasurementSystemUK},
      {"en-GB", "en_GB", 12'345, "7.7 mi", kMeasurementSystemUK},
      {"de", "de_DE", 349.9, "350 m", kMeasurementSystemMetric},
      {"de", "de_DE", 1234.567, "1,2 km", kMeasurementSystemMetric},
      {"de", "de_DE", 123'456, "123 km", kMeasurementSystemMetric},
      {"fr", "fr_FR", 5'678, "5,7\u202Fkm", kMeasurementSystemMetric},
      {"de", "en_US", 12'345, "7,7 mi", kMeasurementSystemUS},  // German words, US units
      {"en-US", "de_DE", 1234.567, "1,2 km", kMeasurementSystemMetric},  // en_DE writes a decimal comma
      {"en", "en", 1234.567, "0.77 mi", kMeasurementSystemUS},  // no region: the likeliest, US
  };
  for (const auto& c : cases) {
    const auto calculator = KYDistanceCalculator::initWithDefaultsSuiteName(kSuite, c.language, c.system);
    const auto [from, to] = apart(c.metres);
    EXPECT_EQ(calculator->localizedDistanceFromLocation(from, to), c.text) << c.language << " " << c.system;
    EXPECT_EQ(calculator->measurementSystem(), c.measurementSystem) << c.language << " " << c.system;
  }
}

TEST_F(DistanceCalculatorTest, ThePhraseComesFromTheDelegateInTheWordsLanguage) {
  const auto [from, to] = apart(1234.567);
  const auto german = KYDistanceCalculator::initWithDefaultsSuiteName(kSuite, "de", "de_DE");
  german->setLocalizationDelegate(services().localization.get());
  EXPECT_EQ(german->localizedDistanceFromLocation(from, to), "1,2 km entfernt");
  const auto french = KYDistanceCalculator::initWithDefaultsSuiteName(kSuite, "fr", "fr_FR");
  french->setLocalizationDelegate(services().localization.get());
  EXPECT_EQ(french->localizedDistanceFromLocation(from, to), "à 1,2\u202Fkm");

  EXPECT_FALSE(german->localizedDistanceFromLocation(from, test::fix(91.0, 0.0)));
}

TEST_F(DistanceCalculatorTest, APreferenceOverridesTheRegionsUnits) {
  const auto [from, to] = apart(1234.567);
  auto prefs = services().preferences.get();
  const struct {
    Value stored;
    const char* text;
    long measurementSystem;
  } cases[] = {
      {"uk", "0,77 mi", kMeasurementSystemUK},
      {"us", "0,77 mi", kMeasurementSystemUS},
      {"metric", "1,2 km", kMeasurementSystemMetric},
      {"imperial", "1,2 km", kMeasurementSystemMetric},  // not a value: the region's units
      {2, "1,2 km", kMeasurementSystemMetric},
  };
  for (const auto& c : cases) {
    prefs->setValue(kSuite, kMeasurementSystemKey, c.stored);
    const auto calculator = KYDistanceCalculator::initWithDefaultsSuiteName(kSuite, "de", "de_DE");
    EXPECT_EQ(calculator->localizedDistanceFromLocation(from, to), c.text) << c.stored;
    EXPECT_EQ(calculator->measurementSystem(), c.measurementSystem) << c.stored;
  }
  prefs->setValue(kSuite, kMeasurementSystemKey, "us");
  const auto [near, by] = apart(350);
  EXPECT_EQ(KYDistanceCalculator::initWithDefaultsSuiteName(kSuite, "en-GB", "en_GB")->localizedDistanceFromLocation(near, by),
            "1,150 ft");
}

}  // namespace
}  // namespace kyn::platform
