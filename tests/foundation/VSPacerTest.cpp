#include <condition_variable>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
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
  Runs(SerialQueue queue, PacerClock& clock) : queue_(std::move(queue)), clock_(clock) {}
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

/// A pacer whose runs are noted; its time passes when a test lets it.
class VSPacerTest : public ::testing::Test {
 protected:
  VSPacerTest() {
    pacer_->setEventBlock([this] { runs_(); });
  }

  void pass(std::chrono::milliseconds time) {
    clock_.pass(time);
    pacer_->waitUntilIdle();
  }
  void signal() {
    pacer_->signal();
    pacer_->waitUntilIdle();
  }

  FakePacerClock clock_;
  SerialQueue queue_{"pacer test"};
  Runs runs_{queue_, clock_};
  std::unique_ptr<VSPacer> pacer_ = std::make_unique<VSPacer>("pacer", queue_, 40ms, clock_);
};

TEST_F(VSPacerTest, MergesWhatComesWhileARunIsPending) {
  pacer_->signal();
  pacer_->resume();
  pacer_->waitUntilIdle();
  for (int i = 0; i < 1000; ++i)
    pacer_->signal();
  clock_.pass(39ms);
  pass(1ms);
  clock_.pass(1h);
  signal();
  EXPECT_THAT(runs_.starts(), ElementsAre(0ms, 40ms, 1h + 40ms)) << "after a rest it runs at once";
}

TEST_F(VSPacerTest, SignalsLaterUnlessItRanMeanwhile) {
  pacer_->resume();
  pacer_->signalAfter(10s);
  pacer_->waitUntilIdle();
  pass(10s);
  pacer_->signalAfter(10s);
  clock_.pass(5s);
  signal();
  pass(1min);
  EXPECT_THAT(runs_.starts(), ElementsAre(10s, 15s));
}

TEST_F(VSPacerTest, ASignalDuringARunMakesAnother) {
  runs_.hold(true);
  pacer_->resume();
  pacer_->signal();
  runs_.waitFor(1);
  pacer_->signal();
  runs_.hold(false);
  pass(40ms);
  EXPECT_EQ(runs_.starts().size(), 2U);
}

TEST_F(VSPacerTest, EndsWithWhatIsPendingUndone) {
  pacer_->resume();
  signal();
  pacer_->signal();
  pacer_.reset();
  EXPECT_EQ(runs_.starts().size(), 1U);
}

}  // namespace
}  // namespace mirabel
