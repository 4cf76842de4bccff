// Presenting a search answer of 50 friends, as a host does for each answer: per friend the place
// text, the age texts, the time of the fix and the distance from the user. The formatters and the
// distance calculator are built once, before the loop, as they are once per process.
#include "model/KYNAXLocation.h"
#include "platform/Services.h"
#include "support/Fakes.h"
#include "utils/KYNAXUtils.h"

#include <benchmark/benchmark.h>

#include <memory>
#include <string>
#include <vector>

namespace {

using namespace kyn;

constexpr int kFriends = 50;

struct Answer {
  test::TempDir configDir;
  std::vector<std::shared_ptr<KYNAXLocation>> friends;
  std::shared_ptr<const platform::Location> here;

  Answer() {
    auto& s = platform::services();
    s.configure(configDir.path());
    s.log().setMinimumLevel(platform::LogLevel::Error);  // the distance line is not written
    const double now = s.clock.get()->now();
    for (int i = 0; i < kFriends; ++i) {
      auto location = std::make_shared<AXKynLocation>();
      location->friend_ = std::make_shared<AXPersonAttribute>();
      location->friend_->object = test::makePerson({"friend" + std::to_string(i) + "@example.com"}, {},
                                                   "Friend Number " + std::to_string(i));
      location->latitude = 45.5 + i * 0.01;
      location->longitude = -122.6 - i * 0.01;
      location->city = "Portland";
      location->stateCode = "OR";
      if (i % 3 == 0) location->label = "Work";
      location->locationDate = now - i * 3'000.0;  // today, yesterday and before
      friends.push_back(KYNAXLocation::locationWithAvixLocation(location));
    }
    auto at = std::make_shared<platform::Location>();
    at->coordinate = {45.5231, -122.6765};
    here = at;
    // Build the shared formatters and the calculator now, as the first answer of a process does.
    (void)friends.front()->prettyTimestamp();
    (void)friends.front()->distanceFromLocation(here);
    (void)KYNAXUtils::dictionaryWithAgeStringsForDate(now);
  }
};

void BM_PresentFiftyFriends(benchmark::State& state) {
  static Answer answer;
  for (auto _ : state) {
    for (const auto& record : answer.friends) {
      auto place = record->friendLocation(true);
      auto age = KYNAXUtils::dictionaryWithAgeStringsForDate(record->avixLocation->locationDate);
      auto time = record->prettyTimestamp();
      auto distance = record->distanceFromLocation(answer.here);
      benchmark::DoNotOptimize(place);
      benchmark::DoNotOptimize(age);
      benchmark::DoNotOptimize(time);
      benchmark::DoNotOptimize(distance);
    }
  }
  state.SetItemsProcessed(state.iterations() * kFriends);
}
BENCHMARK(BM_PresentFiftyFriends)->Unit(benchmark::kMicrosecond);

}  // namespace
