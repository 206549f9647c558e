#include <atomic>
#include <gtest/gtest.h>
#include <latch>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "host/bus/CallLane.h"

namespace mirabel::testing {
namespace {

using bus::CallLane;

/// Three callers have twenty calls each waiting before the first of them runs.
struct Crowd {
  static constexpr int callers = 3, each = 20;

  explicit Crowd(std::size_t threads) : lane({threads, 1, each, 1, 0}) {
    for (std::size_t thread = 0; thread < threads; ++thread) {
      EXPECT_TRUE(lane.submit("gate" + std::to_string(thread),
                              [this](const auto&) { everybodyAsked.wait(); }, {}));
    }
    for (int caller = 0; caller < callers; ++caller) {
      for (int call = 0; call < each; ++call) {
        EXPECT_TRUE(lane.submit(std::to_string(caller),
                                [this, caller, call](const auto&) { serve(caller, call); }, {}));
      }
    }
    everybodyAsked.count_down();
    served.wait();
  }
  void serve(int caller, int call) {
    const bool isAlone = ++running[caller] == 1;
    {
      const std::lock_guard lock(mutex);
      order.emplace_back(caller, call);
      ranTwoOfOne |= !isAlone;
    }
    --running[caller];
    served.count_down();
  }

  std::latch everybodyAsked{1}, served{callers * each};
  std::mutex mutex;
  std::vector<std::pair<int, int>> order;
  std::atomic<int> running[callers] = {};
  bool ranTwoOfOne = false;
  CallLane lane;
};

TEST(CallLane, CallersTakeTurnsAndEachIsServedInOrder) {
  const Crowd one(1);
  for (int i = 0; i < Crowd::callers * Crowd::each; ++i)
    EXPECT_EQ(one.order[i], std::pair(i % Crowd::callers, i / Crowd::callers));

  const Crowd several(3);
  EXPECT_FALSE(several.ranTwoOfOne);
  int next[Crowd::callers] = {};
  for (const auto& [caller, call] : several.order)
    EXPECT_EQ(call, next[caller]++);
}

TEST(CallLane, RefusesCallsOfACallerThatWouldHoldMuch) {
  std::mutex busy;
  CallLane lane({1, 1, 5, 2, 100});
  const std::lock_guard lock(busy);  // goes before the lane does, so that its call ends
  const auto waits = [&busy](const auto&) { const std::lock_guard untilFree(busy); };
  const auto nothing = [](const auto&) {};
  const CallLane::Holds file{0, true};
  // Only what waits counts: this may have begun or not.
  ASSERT_TRUE(lane.submit("one", waits, {}));
  EXPECT_TRUE(lane.submit("one", nothing, file));
  EXPECT_TRUE(lane.submit("one", nothing, file));
  EXPECT_FALSE(lane.submit("one", nothing, file));
  EXPECT_TRUE(lane.submit("one", nothing, {60}));
  EXPECT_FALSE(lane.submit("one", nothing, {41}));
  EXPECT_TRUE(lane.submit("other", nothing, file));
  EXPECT_TRUE(lane.submit("other", nothing, {100}));
  lane.forget("one");
  EXPECT_TRUE(lane.submit("one", nothing, {100, true}));
}

}  // namespace
}  // namespace mirabel::testing
