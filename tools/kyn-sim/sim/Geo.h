#pragma once

#include <string>
#include <string_view>

namespace kyn::sim {

struct Coordinate {
  double latitude = 0.0;
  double longitude = 0.0;
};

/// Great-circle distance in metres on a sphere of the Earth's mean radius. Good to a few tenths of
/// a percent, which is all a proximity test and a displayed distance need.
[[nodiscard]] double distanceInMeters(Coordinate a, Coordinate b) noexcept;

/// Radius in metres that a proximity word stands for: "at" 150, "near" 2000, anything else 500.
[[nodiscard]] double proximityRadius(std::string_view proximity) noexcept;

/// A distance as the server writes it: one decimal, "." as separator, whatever the process locale.
[[nodiscard]] std::string distanceText(double meters);

}  // namespace kyn::sim
