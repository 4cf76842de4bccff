#include "sim/Geo.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <numbers>

namespace kyn::sim {

namespace {
constexpr double kEarthMeanRadius = 6'371'008.8;  // metres (IUGG mean radius)

double radians(double degrees) noexcept { return degrees * std::numbers::pi / 180.0; }
}  // namespace

double distanceInMeters(Coordinate a, Coordinate b) noexcept {
  // Haversine: numerically stable for the short distances that proximity tests are about.
  const double dLat = radians(b.latitude - a.latitude);
  const double dLon = radians(b.longitude - a.longitude);
  const double s = std::sin(dLat / 2) * std::sin(dLat / 2) +
                   std::cos(radians(a.latitude)) * std::cos(radians(b.latitude)) * std::sin(dLon / 2) *
                       std::sin(dLon / 2);
  return 2 * kEarthMeanRadius * std::asin(std::min(1.0, std::sqrt(s)));
}

double proximityRadius(std::string_view proximity) noexcept {
  if (proximity == "at") return 150.0;
  if (proximity == "near") return 2000.0;
  return 500.0;
}

std::string distanceText(double meters) {
  // std::to_chars never consults the locale, unlike printf.
  char buffer[64];
  const auto [end, ec] = std::to_chars(buffer, buffer + sizeof buffer, meters, std::chars_format::fixed, 1);
  if (ec != std::errc{}) return "0.0";
  return {buffer, end};
}

}  // namespace kyn::sim
