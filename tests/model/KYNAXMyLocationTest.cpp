#include "model/KYNAXMyLocation.h"
#include "support/PlatformTest.h"

namespace kyn {
namespace {

using KYNAXMyLocationTest = test::PlatformTest;

TEST_F(KYNAXMyLocationTest, TheUserIsNamedByThePreferredAddressElseTheAccount) {
  systemInfo->signIn("P-1", "token", "host", "ada.account@example.test");
  const Value entry = Value::object();
  EXPECT_EQ(KYNAXMyLocation::myLocation(true, &entry, std::nullopt)->friendHandle(), "ada.account@example.test");
  EXPECT_EQ(KYNAXMyLocation::myLocation(true, &entry, "ada@example.com")->friendHandle(), "ada@example.com");

  // Built around an assistant location: that very object, with the friend it already had; the
  // user's contact is looked up all the same.
  auto given = std::make_shared<AXKynLocation>();
  const auto wrapped = KYNAXMyLocation::myLocation(false, given, "ada@example.com");
  EXPECT_EQ(wrapped->avixLocation, given);
  EXPECT_FALSE(given->friend_);
  EXPECT_GT(addressBook->queries, 0);
  EXPECT_FALSE(wrapped->isVisible);
  EXPECT_EQ(KYNAXMyLocation::myLocation(false, std::shared_ptr<AXKynLocation>(), "ada@example.com")->friendHandle(),
            "ada@example.com");
}

TEST_F(KYNAXMyLocationTest, AHiddenLocationShowsNothingOfThePlaceAndNeverATime) {
  const Value entry = Value::parse(R"({"location":{"latitude":45.5,"longitude":-122.6,"timestamp":1763740500000,
                                     "labels":[{"label":"Home"}],"address":{"locality":"Portland"}}})");
  const auto hidden = KYNAXMyLocation::myLocation(false, &entry, "ada@example.com");
  EXPECT_EQ(hidden->friendLocation(true), "Location hidden");
  EXPECT_EQ(hidden->avixLocation->label, "Home");  // decoded all the same
  const auto visible = KYNAXMyLocation::myLocation(true, &entry, "ada@example.com");
  EXPECT_EQ(visible->friendLocation(true), "Home");
  EXPECT_TRUE(visible->avixLocation->locationDate);
  EXPECT_FALSE(visible->prettyTimestamp());
  const std::shared_ptr<KYNAXLocation> asBase = visible;
  EXPECT_FALSE(asBase->prettyTimestamp());
  assistant->setLanguageCode("fr");
  EXPECT_EQ(hidden->friendLocation(false), "Position masquée");
}

}  // namespace
}  // namespace kyn
