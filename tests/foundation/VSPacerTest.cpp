#include <future>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <utility>
#include <vector>

#include "foundation/VSPacer.h"
#include "support/FakePacerClock.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;
using testing::FakePacerClock;

/// A pacer whose runs are noted; its time passes when a test lets it.
class VSPacerTest : public ::testing::Test {
 protected:
  VSPacerTest() {
    pacer_->setEventBlock([this] {
      queue_.assertOnQueue();
      starts_.push_back(clock_.now().time_since_epoch());
      if (!std::exchange(signalsWhileItRuns_, false)) return;
      pacer_->signal();
      hasSignalled_.set_value();
    });
  }

  void pass(std::chrono::milliseconds time) {
    clock_.pass(time);
    pacer_->waitUntilIdle();
  }
  void signal() {
    pacer_->signal();
    pacer_->waitUntilIdle();
  }
  std::vector<PacerClock::Time::duration> starts() {
    std::vector<PacerClock::Time::duration> starts;
    queue_.sync([&] { starts = starts_; });
    return starts;
  }

  FakePacerClock clock_;
  SerialQueue queue_{"pacer test"};
  std::vector<PacerClock::Time::duration> starts_;
  bool signalsWhileItRuns_ = false;
  std::promise<void> hasSignalled_;
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
  EXPECT_THAT(starts(), ElementsAre(0ms, 40ms, 1h + 40ms)) << "after a rest it runs at once";
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
  EXPECT_THAT(starts(), ElementsAre(10s, 15s));
}

TEST_F(VSPacerTest, ASignalDuringARunMakesAnother) {
  signalsWhileItRuns_ = true;
  pacer_->resume();
  pacer_->signal();
  hasSignalled_.get_future().wait();
  pass(40ms);
  EXPECT_EQ(starts().size(), 2U);
}

TEST_F(VSPacerTest, EndsWithWhatIsPendingUndone) {
  pacer_->resume();
  signal();
  pacer_->signal();
  pacer_.reset();
  EXPECT_EQ(starts().size(), 1U);
}

}  // namespace
}  // namespace mirabel
