#include "platform/notify/NotificationCenter.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

namespace kyn::platform {
namespace {

class Named final : public Object {
 public:
  explicit Named(std::string n) : name(std::move(n)) {}
  std::string description() const override { return name; }
  std::string name;
};

TEST(NotificationCenter, DeliversByNameInOrderOfRegistration) {
  NotificationCenter center;
  std::vector<std::string> seen;
  center.addObserver("a", [&](const Notification& n) { seen.push_back("1:" + n.object->description()); });
  center.addObserver("b", [&](const Notification&) { seen.push_back("b"); });
  center.addObserver("a", [&](const Notification& n) { seen.push_back("2:" + n.object->description()); });
  center.post({"a", std::make_shared<Named>("x")});
  EXPECT_EQ(seen, (std::vector<std::string>{"1:x", "2:x"}));
}

TEST(NotificationCenter, RemovedObserversAreNotCalledAndAThrowingObserverStopsNoOne) {
  NotificationCenter center;
  int calls = 0, once = 0;
  auto token = center.addObserver("a", [&](const Notification&) { ++calls; });
  NotificationCenter::Token self = 0;
  self = center.addObserver("a", [&](const Notification&) {  // an observer may remove itself
    ++once;
    center.removeObserver(self);
  });
  center.addObserver("a", [](const Notification&) { throw std::runtime_error("observer failure"); });
  int after = 0;
  center.addObserver("a", [&](const Notification&) { ++after; });
  center.post({"a", nullptr});
  center.removeObserver(token);
  center.removeObserver(token);  // a second removal is harmless
  center.post({"a", nullptr});
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(once, 1);
  EXPECT_EQ(after, 2);
}

TEST(NotificationCenter, NoCallAfterRemovalReturnsWhilePostingFromAnotherThread) {
  NotificationCenter center;
  for (int round = 0; round < 50; ++round) {
    auto alive = std::make_shared<std::atomic<bool>>(true);
    std::atomic<int> violations{0};
    auto token = center.addObserver("tick", [alive, &violations](const Notification&) {
      if (!alive->load()) ++violations;
    });
    std::atomic<bool> stop{false};
    std::thread poster([&] {
      while (!stop.load()) center.post({"tick", nullptr});
    });
    std::this_thread::yield();
    center.removeObserver(token);
    alive->store(false);  // from here on, a call would be a call after removal
    for (int i = 0; i < 100; ++i) center.post({"tick", nullptr});
    stop.store(true);
    poster.join();
    ASSERT_EQ(violations.load(), 0) << "round " << round;
  }
}

}  // namespace
}  // namespace kyn::platform
