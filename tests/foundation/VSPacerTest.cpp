#include <condition_variable>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>
#include <vector>

#include "foundation/VSPacer.h"
#include "support/FakePacerClock.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;
using testing::FakePacerClock;

/// A block that notes when it ran and where, and can be held up.
class Runs {
 public:
  explicit Runs(SerialQueue queue, PacerClock& clock = PacerClock::steady())
      : queue_(std::move(queue)), clock_(clock) {}
  void operator()() {
    queue_.assertOnQueue();
    std::unique_lock lock(mutex_);
    starts_.push_back(clock_.now().time_since_epoch());
    changed_.notify_all();
    changed_.wait(lock, [this] { return !isHeld_; });
  }
  void hold(bool held) {
    const std::lock_guard lock(mutex_);
    isHeld_ = held;
    changed_.notify_all();
  }
  void waitFor(std::size_t count) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return starts_.size() >= count; });
  }
  std::vector<PacerClock::Time::duration> starts() {
    const std::lock_guard lock(mutex_);
    return starts_;
  }

 private:
  SerialQueue queue_;
  PacerClock& clock_;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool isHeld_ = false;
  std::vector<PacerClock::Time::duration> starts_;
};

TEST(VSPacer, MergesWhatComesWhileARunIsPending) {
  FakePacerClock clock;
  SerialQueue queue("pacer test");
  Runs runs(queue, clock);
  VSPacer pacer("pacer", queue, 40ms, clock);
  pacer.setEventBlock([&] { runs(); });
  pacer.signal();
  pacer.resume();
  pacer.waitUntilIdle();
  for (int i = 0; i < 1000; ++i)
    pacer.signal();
  clock.pass(39ms);
  clock.pass(1ms);
  pacer.waitUntilIdle();
  clock.pass(1h);
  pacer.signal();
  pacer.waitUntilIdle();
  EXPECT_THAT(runs.starts(), ElementsAre(0ms, 40ms, 1h + 40ms)) << "after a rest it runs at once";
}

TEST(VSPacer, SignalsLaterUnlessItRanMeanwhile) {
  FakePacerClock clock;
  SerialQueue queue("pacer test");
  Runs runs(queue, clock);
  VSPacer pacer("pacer", queue, 1ms, clock);
  pacer.setEventBlock([&] { runs(); });
  pacer.resume();
  pacer.signalAfter(10s);
  pacer.waitUntilIdle();
  clock.pass(10s);
  pacer.waitUntilIdle();
  pacer.signalAfter(10s);
  clock.pass(5s);
  pacer.signal();
  pacer.waitUntilIdle();
  clock.pass(1min);
  pacer.waitUntilIdle();
  EXPECT_THAT(runs.starts(), ElementsAre(10s, 15s));
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
  runs.waitFor(2);
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
  EXPECT_EQ(runs.starts().size(), 1U);
}

}  // namespace
}  // namespace mirabel
