#include "support/PlatformTest.h"
#include "platform/value/Json.h"
#include "utils/KYNAXUtils.h"

#include <cmath>

namespace kyn {
namespace {

class LocationConversionTest : public test::PlatformTest {
 protected:
  static std::shared_ptr<AXLocation> ax(std::optional<double> lat, std::optional<double> lon,
                                        std::optional<double> accuracy = std::nullopt) {
    auto l = std::make_shared<AXLocation>();
    l->latitude = lat;
    l->longitude = lon;
    l->accuracy = accuracy;
    return l;
  }
};

TEST_F(LocationConversionTest, ZeroOrMissingCoordinatesAreNoLocation) {
  EXPECT_FALSE(KYNAXUtils::coreLocationForAXLocation(nullptr));
  for (const auto& l : {ax(0.0, 20.0), ax(10.0, 0.0), ax(std::nullopt, 20.0), ax(10.0, std::nullopt)}) {
    EXPECT_FALSE(KYNAXUtils::coreLocationForAXLocation(l)) << l->dictionary();
  }
  // There is no range check until the dictionary.
  const auto unchecked = KYNAXUtils::coreLocationForAXLocation(ax(std::nan(""), 20.0));
  ASSERT_TRUE(unchecked);
  EXPECT_FALSE(KYNAXUtils::dictionaryForLocation(unchecked));
}

TEST_F(LocationConversionTest, AnAssistantLocationBecomesAFixStampedNow) {
  auto l = KYNAXUtils::coreLocationForAXLocation(ax(10.0, 20.0));
  ASSERT_TRUE(l);
  EXPECT_EQ(l->coordinate.latitude, 10.0);
  EXPECT_EQ(l->coordinate.longitude, 20.0);
  EXPECT_EQ(l->horizontalAccuracy, 0.0);
  EXPECT_EQ(l->timestamp, clock->now());
  EXPECT_EQ(KYNAXUtils::coreLocationForAXLocation(ax(10.0, 20.0, 65.0))->horizontalAccuracy, 65.0);
}

TEST_F(LocationConversionTest, TheDictionaryHoldsCoordinateAndSourceInOrder) {
  const auto d = KYNAXUtils::dictionaryForLocation(test::fix(48.8566, 2.3522, 65.0, 0.5));
  ASSERT_TRUE(d);
  EXPECT_EQ(platform::toJson(*d),
            R"({"latitude":48.8566,"longitude":2.3522,"source":"assistant","horizontalAccuracy":65.0,)"
            R"("timestamp":978307200500.0})");
}

TEST_F(LocationConversionTest, OnlyTheLowEightBitsOfTheWholeMetresDecideTheAccuracy) {
  // Sent ones go as they are.
  for (const double sent : {65.0, 1.0, 255.9, 257.5, -1.0}) {
    EXPECT_EQ((*KYNAXUtils::dictionaryForLocation(test::fix(10, 20, sent)))["horizontalAccuracy"], sent) << sent;
  }
  for (const double dropped : {0.4, 0.0, 256.0, 256.9, 512.3, -256.0, std::nan(""), HUGE_VAL, 1e12}) {
    EXPECT_FALSE(KYNAXUtils::dictionaryForLocation(test::fix(10, 20, dropped))->contains("horizontalAccuracy")) << dropped;
  }
}

TEST_F(LocationConversionTest, AZeroMissingOrUnknownTimestampIsLeftOut) {
  for (const std::optional<double> t : {std::optional(0.0), std::optional<double>(), std::optional(std::nan(""))}) {
    EXPECT_FALSE(KYNAXUtils::dictionaryForLocation(test::fix(10, 20, 10, t))->contains("timestamp"));
  }
}

TEST_F(LocationConversionTest, CoordinateValidity) {
  for (auto [lat, lon] : {std::pair{90.0, 180.0}, {-90.0, -180.0}, {0.0, 0.0}}) {
    EXPECT_TRUE(KYNAXUtils::dictionaryForLocation(test::fix(lat, lon))) << lat << "," << lon;
  }
  for (auto [lat, lon] : {std::pair{91.0, 0.0}, {0.0, 180.5}, {-90.1, 0.0}, {INFINITY, 0.0}, {0.0, std::nan("")}}) {
    EXPECT_FALSE(KYNAXUtils::dictionaryForLocation(test::fix(lat, lon))) << lat << "," << lon;
  }
  EXPECT_FALSE(KYNAXUtils::dictionaryForLocation(std::shared_ptr<const platform::Location>()));
}

}  // namespace
}  // namespace kyn
