#include "sim/Geo.h"

#include <gtest/gtest.h>

#include <locale>
#include <sstream>

namespace kyn::sim {
namespace {

// One degree of latitude on the mean sphere, in metres.
constexpr double kMetresPerDegree = 111'195.08;

TEST(GeoTest, DistancesOnTheSphere) {
  EXPECT_NEAR(distanceInMeters({0, 0}, {1, 0}), kMetresPerDegree, 0.1);
  EXPECT_NEAR(distanceInMeters({0, 0}, {0, 1}), kMetresPerDegree, 0.1);  // on the equator
  EXPECT_NEAR(distanceInMeters({60, 0}, {60, 1}), kMetresPerDegree / 2, 1.0);  // cos 60°
  EXPECT_EQ(distanceInMeters({45.5152, -122.6784}, {45.5152, -122.6784}), 0.0);
  const Coordinate a{45.5152, -122.6784}, b{-37.8136, 144.9631};
  EXPECT_DOUBLE_EQ(distanceInMeters(a, b), distanceInMeters(b, a));
  // Antipodes: half the circumference, where a naive acos loses precision or yields NaN.
  EXPECT_NEAR(distanceInMeters({0, 0}, {0, 180}), kMetresPerDegree * 180, 1.0);
}

struct CommaDecimal : std::numpunct<char> {
  char do_decimal_point() const override { return ','; }
  char do_thousands_sep() const override { return '.'; }
  std::string do_grouping() const override { return "\3"; }
};

TEST(GeoTest, DistanceTextHasOneDecimalAndAPointInAnyLocale) {
  EXPECT_EQ(distanceText(0.0), "0.0");
  EXPECT_EQ(distanceText(1523.46), "1523.5");
  EXPECT_EQ(distanceText(12'345'678.9), "12345678.9");

  const std::locale previous = std::locale::global(std::locale(std::locale::classic(), new CommaDecimal));
  EXPECT_EQ(distanceText(1523.44), "1523.4");
  std::locale::global(previous);
}

}  // namespace
}  // namespace kyn::sim
