#include <condition_variable>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>
#include <vector>

#include "foundation/VSPacer.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

/// A block that notes when it ran and where, and can be held up.
class Runs {
 public:
  explicit Runs(SerialQueue queue) : queue_(std::move(queue)) {}
  void operator()() {
    queue_.assertOnQueue();
    std::unique_lock lock(mutex_);
    starts_.push_back(Clock::now());
    changed_.notify_all();
    changed_.wait(lock, [this] { return !isHeld_; });
  }
  void hold(bool held) {
    const std::lock_guard lock(mutex_);
    isHeld_ = held;
    changed_.notify_all();
  }
  std::vector<Clock::time_point> waitFor(std::size_t count) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return starts_.size() >= count; });
    return starts_;
  }

 private:
  SerialQueue queue_;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool isHeld_ = false;
  std::vector<Clock::time_point> starts_;
};

TEST(VSPacer, MergesWhatComesWhileARunIsPending) {
  constexpr auto interval = 40ms;
  SerialQueue queue("pacer test");
  Runs runs(queue);
  VSPacer pacer("pacer", queue, interval);
  pacer.setEventBlock([&] { runs(); });
  pacer.signal();
  pacer.resume();
  runs.waitFor(1);
  const auto begin = Clock::now();
  for (int i = 0; i < 1000; ++i)
    pacer.signal();
  pacer.waitUntilIdle();
  const auto starts = runs.waitFor(2);
  const auto intervals = (Clock::now() - begin) / interval;
  EXPECT_LE(starts.size(), static_cast<std::size_t>(intervals) + 2);
  // The pacer counts from before the block, which may have been held up on the way.
  constexpr auto delay = 20ms;
  for (std::size_t i = 1; i < starts.size(); ++i)
    EXPECT_GE(starts[i] - starts[i - 1], interval - delay);
}

TEST(VSPacer, ASignalDuringARunMakesAnother) {
  SerialQueue queue("pacer test");
  Runs runs(queue);
  runs.hold(true);
  VSPacer pacer("pacer", queue, 1ms);
  pacer.setEventBlock([&] { runs(); });
  pacer.resume();
  pacer.signal();
  runs.waitFor(1);
  pacer.signal();
  runs.hold(false);
  EXPECT_GE(runs.waitFor(2).size(), 2U);
}

TEST(VSPacer, EndsWithWhatIsPendingUndone) {
  SerialQueue queue("pacer test");
  Runs runs(queue);
  {
    VSPacer pacer("pacer", queue, 1h);
    pacer.setEventBlock([&] { runs(); });
    pacer.resume();
    pacer.signal();
    runs.waitFor(1);
    pacer.signal();
  }
  EXPECT_EQ(runs.waitFor(1).size(), 1U);
}

}  // namespace
}  // namespace mirabel
