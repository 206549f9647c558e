#pragma once

#include "foundation/VSPacer.h"

namespace mirabel::testing {

/// The time of one pacer, which passes when the test says so.
class FakePacerClock final : public PacerClock {
 public:
  Time now() override {
    const std::lock_guard lock(mutex_);
    return now_;
  }
  void waitUntil(Time time, std::condition_variable& changed,
                 std::unique_lock<std::mutex>& lock) override {
    {
      const std::lock_guard own(mutex_);
      if (now_ >= time) return;
      waiting_ = &changed;
      waitingLock_ = lock.mutex();
    }
    changed.wait(lock);
  }

  /// Not while the pacer goes.
  void pass(std::chrono::milliseconds time) {
    std::unique_lock own(mutex_);
    now_ += time;
    if (waiting_ == nullptr) return;
    std::mutex& theirs = *waitingLock_;
    own.unlock();
    // Who saw the time of before holds this until it waits.
    const std::lock_guard lock(theirs);
    waiting_->notify_all();
  }

 private:
  std::mutex mutex_;
  Time now_{};
  std::condition_variable* waiting_ = nullptr;
  std::mutex* waitingLock_ = nullptr;
};

}  // namespace mirabel::testing
