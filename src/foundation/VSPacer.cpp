#include "foundation/VSPacer.h"

#include <condition_variable>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>

namespace mirabel {

struct VSPacer::State {
  using Clock = std::chrono::steady_clock;

  State(std::string called, SerialQueue target, std::chrono::milliseconds minimum)
      : name(std::move(called)), queue(std::move(target)), interval(minimum) {}

  const std::string name;
  SerialQueue queue;
  const std::chrono::milliseconds interval;
  EventBlock block;
  std::mutex mutex;
  std::condition_variable changed;  // of what follows, with the mutex
  bool isPending = false;
  bool isRunning = false;
  bool isEnding = false;
  std::optional<Clock::time_point> lastStart;
  std::thread thread;

  void run() {
    std::unique_lock lock(mutex);
    for (;;) {
      changed.wait(lock, [this] { return isPending || isEnding; });
      if (lastStart) {
        changed.wait_until(lock, *lastStart + interval, [this] { return isEnding; });
      }
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
      lastStart = Clock::now();
    }
    block();
  }
};

VSPacer::VSPacer(std::string name, SerialQueue queue, std::chrono::milliseconds minimumFireInterval)
    : state_(std::make_unique<State>(std::move(name), std::move(queue), minimumFireInterval)) {}

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

void VSPacer::waitUntilIdle() {
  std::unique_lock lock(state_->mutex);
  state_->changed.wait(lock, [this] { return !state_->isPending && !state_->isRunning; });
}

const std::string& VSPacer::name() const {
  return state_->name;
}

}  // namespace mirabel
