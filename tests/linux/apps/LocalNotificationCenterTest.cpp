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

// A callback holds what it captures until its observer is removed, which is how a test sees that.
void awaitEnd(const std::weak_ptr<int>& captured) {
  while (!captured.expired())
    std::this_thread::yield();
}

TEST(LocalNotificationCenterTest, RemovalAndEndWaitForTheCallbackThatRunsAndDropTheRest) {
  for (const bool ends : {false, true}) {
    std::optional<LocalNotificationCenter> center(std::in_place);
    std::promise<void> entered;
    std::atomic<int> calls = 0;
    std::atomic<bool> isDone = false;
    auto token = std::make_shared<int>();
    const std::weak_ptr<int> other = token;
    center->addObserver(&calls, "a", [&](std::string_view) {
      ++calls;
      entered.set_value();
      awaitEnd(other);
      isDone = true;
    });
    center->addObserver(&calls, "b", [&, token = std::move(token)](std::string_view) { ++calls; });
    center->post("a");
    center->post("b");
    entered.get_future().wait();
    if (ends) {
      center.reset();
    } else {
      center->removeEveryObserver(&calls);
    }
    EXPECT_TRUE(isDone);
    EXPECT_EQ(calls, 1);
  }
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

}  // namespace
}  // namespace mirabel::testing
