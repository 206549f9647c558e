#include <atomic>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string_view>
#include <thread>

#include "linux/apps/LocalNotificationCenter.h"

namespace mirabel::testing {
namespace {

TEST(LocalNotificationCenterTest, RemovalWaitsForTheCallbackThatRuns) {
  LocalNotificationCenter center;
  std::promise<void> entered, goOn;
  std::atomic<bool> isDone = false;
  center.addObserver(&center, "a", [&](std::string_view) {
    if (isDone) return;
    entered.set_value();
    goOn.get_future().wait();
    isDone = true;
  });
  center.post("a");
  entered.get_future().wait();
  // Waits to be delivered, and finds nobody unless it is quicker than the removal.
  center.post("a");
  std::jthread helper([&] { goOn.set_value(); });
  center.removeEveryObserver(&center);
  EXPECT_TRUE(isDone);
}

TEST(LocalNotificationCenterTest, PostsThatWaitAreDeliveredOnce) {
  LocalNotificationCenter center;
  std::promise<void> entered, goOn;
  int calls = 0;
  center.addObserver(&center, "a", [&](std::string_view) {
    if (++calls > 1) return;
    entered.set_value();
    goOn.get_future().wait();
  });
  center.post("a");
  entered.get_future().wait();
  for (int i = 0; i < 1'000; ++i)
    center.post("a");
  goOn.set_value();
  center.removeEveryObserver(nullptr);
  EXPECT_EQ(calls, 2);
}

TEST(LocalNotificationCenterTest, EndDropsWhatIsNotDelivered) {
  std::optional<LocalNotificationCenter> center(std::in_place);
  std::promise<void> entered, goOn;
  std::atomic<int> calls = 0;
  center->addObserver(nullptr, "a", [&](std::string_view) {
    ++calls;
    entered.set_value();
    goOn.get_future().wait();
  });
  center->addObserver(nullptr, "b", [&](std::string_view) { ++calls; });
  center->post("a");
  center->post("b");
  entered.get_future().wait();
  std::jthread helper([&] { goOn.set_value(); });
  center.reset();
  EXPECT_EQ(calls, 1);
}

}  // namespace
}  // namespace mirabel::testing
