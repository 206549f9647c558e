#include <gtest/gtest.h>
#include <mutex>

#include "host/bus/CallLane.h"

namespace mirabel::testing {
namespace {

using bus::CallLane;

TEST(CallLane, RefusesCallsOfACallerThatWouldHoldManyFiles) {
  std::mutex busy;
  CallLane lane({1, 1, 5, 2});
  const std::lock_guard lock(busy);  // goes before the lane does, so that its call ends
  const auto waits = [&busy](const auto&) { const std::lock_guard untilFree(busy); };
  const auto nothing = [](const auto&) {};
  // Only what waits counts: this may have begun or not.
  ASSERT_TRUE(lane.submit("one", waits));
  EXPECT_TRUE(lane.submit("one", nothing, CallLane::Holds::file));
  EXPECT_TRUE(lane.submit("one", nothing, CallLane::Holds::file));
  EXPECT_FALSE(lane.submit("one", nothing, CallLane::Holds::file));
  EXPECT_TRUE(lane.submit("one", nothing));
  EXPECT_TRUE(lane.submit("other", nothing, CallLane::Holds::file));
  lane.forget("one");
  EXPECT_TRUE(lane.submit("one", nothing, CallLane::Holds::file));
}

}  // namespace
}  // namespace mirabel::testing
