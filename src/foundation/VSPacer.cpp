#include "foundation/VSPacer.h"

#include <condition_variable>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>

namespace mirabel {
namespace {

class SteadyClock final : public PacerClock {
 public:
  Time now() override { return std::chrono::steady_clock::now(); }
  void waitUntil(Time time, std::condition_variable& changed,
                 std::unique_lock<std::mutex>& lock) override {
    changed.wait_until(lock, time);
  }
};

}  // namespace

PacerClock& PacerClock::steady() {
  static SteadyClock clock;
  return clock;
}

struct VSPacer::State {
  State(std::string called, SerialQueue target, std::chrono::milliseconds minimum, PacerClock& time)
      : name(std::move(called)), queue(std::move(target)), interval(minimum), clock(time) {}

  const std::string name;
  SerialQueue queue;
  const std::chrono::milliseconds interval;
  PacerClock& clock;
  EventBlock block;
  std::mutex mutex;
  std::condition_variable changed;  // of what follows, with the mutex
  bool isPending = false;
  bool isRunning = false;
  bool isEnding = false;
  std::optional<PacerClock::Time> lastStart;
  std::optional<PacerClock::Time> later;  // when a signal comes by itself
  std::thread thread;

  [[nodiscard]] bool isWanted() const { return isPending || (later && clock.now() >= *later); }

  void awaitSignal(std::unique_lock<std::mutex>& lock) {
    while (!isWanted() && !isEnding) {
      if (later) {
        clock.waitUntil(*later, changed, lock);
      } else {
        changed.wait(lock);
      }
    }
  }

  void awaitInterval(std::unique_lock<std::mutex>& lock) {
    while (lastStart && !isEnding && clock.now() < *lastStart + interval)
      clock.waitUntil(*lastStart + interval, changed, lock);
  }

  void run() {
    std::unique_lock lock(mutex);
    for (;;) {
      awaitSignal(lock);
      awaitInterval(lock);
      if (isEnding) return;
      isRunning = true;
      lock.unlock();
      queue.sync([this] { fire(); });
      lock.lock();
      isRunning = false;
      changed.notify_all();
    }
  }

  // The queue may have been busy: the interval counts from the start of the run.
  void fire() {
    {
      const std::lock_guard lock(mutex);
      isPending = false;
      later.reset();
      lastStart = clock.now();
    }
    block();
  }
};

VSPacer::VSPacer(std::string name, SerialQueue queue, std::chrono::milliseconds minimumFireInterval,
                 PacerClock& clock)
    : state_(
          std::make_unique<State>(std::move(name), std::move(queue), minimumFireInterval, clock)) {}

VSPacer::~VSPacer() {
  {
    const std::lock_guard lock(state_->mutex);
    state_->isEnding = true;
  }
  state_->changed.notify_all();
  if (state_->thread.joinable()) state_->thread.join();
}

void VSPacer::setEventBlock(EventBlock block) {
  state_->block = std::move(block);
}

void VSPacer::resume() {
  if (state_->thread.joinable()) return;
  state_->thread = std::thread([state = state_.get()] { state->run(); });
}

void VSPacer::signal() {
  const std::lock_guard lock(state_->mutex);
  state_->isPending = true;
  state_->changed.notify_all();
}

void VSPacer::signalAfter(std::chrono::milliseconds delay) {
  const std::lock_guard lock(state_->mutex);
  state_->later = state_->clock.now() + delay;
  state_->changed.notify_all();
}

void VSPacer::waitUntilIdle() {
  std::unique_lock lock(state_->mutex);
  state_->changed.wait(lock, [this] { return !state_->isWanted() && !state_->isRunning; });
}

const std::string& VSPacer::name() const {
  return state_->name;
}

}  // namespace mirabel
