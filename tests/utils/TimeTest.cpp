#include "support/PlatformTest.h"
#include "utils/KYNAXUtils.h"
#include "platform/time/SystemTime.h"
#include "platform/localization/IcuLocalization.h"

#include <cmath>

namespace kyn {
namespace {

using platform::services;

class MidnightTest : public test::PlatformTest {};

TEST_F(MidnightTest, TodayAndYesterdayAtMidnightInTheUsersTimeZone) {
  clock->set(test::utcDate(2026, 11, 21, 15, 30, 12.25));
  EXPECT_DOUBLE_EQ(KYNAXUtils::todayAtMidnight(), test::utcDate(2026, 11, 21, 0, 0, 0.25));
  EXPECT_DOUBLE_EQ(KYNAXUtils::yesterdayAtMidnight(), KYNAXUtils::todayAtMidnight() - 86'400.0);

  services().calendar.set(std::make_shared<platform::IcuCalendar>("America/Los_Angeles"));  // UTC-8 in November
  EXPECT_DOUBLE_EQ(KYNAXUtils::todayAtMidnight(), test::utcDate(2026, 11, 21, 8, 0, 0.25));
  clock->set(test::utcDate(2026, 11, 21, 5, 0, 0));  // still the 20th in California
  EXPECT_DOUBLE_EQ(KYNAXUtils::todayAtMidnight(), test::utcDate(2026, 11, 20, 8, 0, 0));
}

TEST_F(MidnightTest, YesterdayIsAFixedDayEvenAcrossAClockChange) {
  services().calendar.set(std::make_shared<platform::IcuCalendar>("Europe/Berlin"));
  clock->set(test::utcDate(2026, 3, 29, 12, 0, 0));  // the day summer time starts
  EXPECT_DOUBLE_EQ(KYNAXUtils::yesterdayAtMidnight(), KYNAXUtils::todayAtMidnight() - 86'400.0);
}

class AgeStringsTest : public test::PlatformTest {
 protected:
  struct Band {
    std::string display;
    std::string spoken;
  };
  Band ageOf(double secondsAgo) {
    const Value d = KYNAXUtils::dictionaryWithAgeStringsForDate(clock->now() - secondsAgo);
    EXPECT_EQ(d.size(), 2u);
    return {d.value(std::string(LabelStringKey), ""), d.value(std::string(LabelAccessibilityStringKey), "")};
  }
};

TEST_F(AgeStringsTest, EveryBandAtItsBoundaries) {
  const std::tuple<double, const char*, const char*> cases[] = {
      {30, "Now", "Located just now"},
      {30.9, "Now", "Located just now"},
      {31, "Over 30 sec ago", "Located more than 30 seconds ago"},
      {59.9, "Over 30 sec ago", "Located more than 30 seconds ago"},
      {60, "1 min ago", "Located 1 minute ago"},
      {119, "1 min ago", "Located 1 minute ago"},
      {120, "2 min ago", "Located 2 minutes ago"},
      {3'599, "59 min ago", "Located 59 minutes ago"},
      {3'600, "Over 1 hr ago", "Located more than 1 hour ago"},
      {7'199, "Over 1 hr ago", "Located more than 1 hour ago"},
      {7'200, "2 hr ago", "Located 2 hours ago"},
      {10'799, "2 hr ago", "Located 2 hours ago"},
      {10'800, "3 hr ago", "Located 3 hours ago"},
      {86'400.0 * 3, "72 hr ago", "Located 72 hours ago"},
      {-90, "1 min ago", "Located 1 minute ago"},  // the future counts like the past
  };
  for (const auto& [secondsAgo, display, spoken] : cases) {
    const Band band = ageOf(secondsAgo);
    EXPECT_EQ(band.display, display) << secondsAgo;
    EXPECT_EQ(band.spoken, spoken) << secondsAgo;
  }
}

TEST_F(AgeStringsTest, NoDateAndUnrepresentableAgesReadAsNow) {
  Value none = KYNAXUtils::dictionaryWithAgeStringsForDate(std::nullopt);
  EXPECT_EQ(none[std::string(LabelStringKey)], "Now");
  EXPECT_EQ(ageOf(2'147'483'647.0).display, "596523 hr ago");  // the largest age that fits
  for (const double beyond : {70.0 * 365 * 86'400, -70.0 * 365 * 86'400, std::nan(""), HUGE_VAL}) {
    EXPECT_EQ(ageOf(beyond).display, "Now") << beyond;  // beyond 32 bits of seconds, or no number
  }
}

TEST_F(AgeStringsTest, TextsFollowTheAssistantsLanguageAndNumbersTheUsersLocale) {
  assistant->setLanguageCode("de-DE");
  EXPECT_EQ(ageOf(300).display, "Vor 5 Min.");
  EXPECT_EQ(ageOf(300).spoken, "Vor 5 Minuten geortet");
  assistant->setLanguageCode("fr");
  EXPECT_EQ(ageOf(60).spoken, "Localisé il y a 1 minute");
  services().numberFormatting.set(std::make_shared<platform::IcuNumberFormatting>("ar_EG"));
  EXPECT_EQ(ageOf(300).display, "Il y a \u0665 min");
}

}  // namespace
}  // namespace kyn
