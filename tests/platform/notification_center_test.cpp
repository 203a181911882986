#include "platform/notification_center.h"

#include <gtest/gtest.h>

namespace cloudreel {
namespace {

TEST(NotificationCenter, DeliversByNameAndSender) {
  NotificationCenter center;
  Observer panel;
  int documentA = 0;
  int documentB = 0;
  std::vector<std::string> seen;
  center.addObserver(panel, "Changed", &documentA,
                     [&](const Notification& n) { seen.push_back("A:" + n.name); });
  center.addObserver(panel, "Changed", nullptr,
                     [&](const Notification& n) { seen.push_back("any:" + n.name); });
  center.addObserver(panel, "Closed", nullptr, [&](const Notification& n) {
    EXPECT_EQ(n.object, &documentB);
    EXPECT_EQ(std::get<std::int32_t>(n.userInfo.at("count")), 3);
    seen.push_back("closed");
  });

  center.postNotificationName("Changed", &documentA);
  center.postNotificationName("Changed", &documentB);
  center.postNotificationName("Closed", &documentB, {{"count", Value(std::int32_t{3})}});
  center.postNotificationName("Unrelated", &documentA);
  EXPECT_EQ(seen, std::vector<std::string>({"A:Changed", "any:Changed", "any:Changed", "closed"}));
}

TEST(NotificationCenter, RemovalAndDestroyedObservers) {
  NotificationCenter center;
  Observer kept;
  int calls = 0;
  center.addObserver(kept, "N", nullptr, [&](const Notification&) { ++calls; });
  center.addObserver(kept, "M", nullptr, [&](const Notification&) { ++calls; });
  {
    Observer gone;
    center.addObserver(gone, "N", nullptr, [&](const Notification&) { calls += 100; });
  }
  center.postNotificationName("N", nullptr);
  EXPECT_EQ(calls, 1);

  center.removeObserver(kept, "N", nullptr);
  center.postNotificationName("N", nullptr);
  center.postNotificationName("M", nullptr);
  EXPECT_EQ(calls, 2);

  center.removeObserver(kept);
  center.removeObserver(kept);  // nothing left: harmless
  center.postNotificationName("M", nullptr);
  EXPECT_EQ(calls, 2);
}

TEST(NotificationCenter, AnObserverRemovedByAnEarlierHandlerIsNotCalled) {
  NotificationCenter center;
  Observer first;
  Observer second;
  bool secondCalled = false;
  center.addObserver(first, "N", nullptr, [&](const Notification&) { center.removeObserver(second); });
  center.addObserver(second, "N", nullptr, [&](const Notification&) { secondCalled = true; });
  center.postNotificationName("N", nullptr);
  EXPECT_FALSE(secondCalled);
}

}  // namespace
}  // namespace cloudreel
