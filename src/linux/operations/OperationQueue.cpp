#include "linux/operations/OperationQueue.h"

#include <condition_variable>
#include <deque>
#include <mutex>

#include "foundation/ThreadPool.h"

namespace mirabel {

struct OperationQueue::State {
  explicit State(std::size_t most) : mostAtOnce(most) {}

  const std::size_t mostAtOnce;
  std::mutex mutex;
  std::condition_variable isIdle;
  std::deque<std::function<void()>> waiting;
  std::size_t running = 0;

  /// One thread's share: it goes on for as long as something waits.
  void work() {
    std::unique_lock lock(mutex);
    while (!waiting.empty()) {
      {
        const std::function<void()> next = std::move(waiting.front());
        waiting.pop_front();
        lock.unlock();
        next();
      }
      lock.lock();
    }
    if (--running == 0) isIdle.notify_all();
  }
};

OperationQueue::OperationQueue(std::size_t mostAtOnce)
    : state_(std::make_shared<State>(mostAtOnce)) {}

OperationQueue::~OperationQueue() {
  drain();
}

void OperationQueue::add(std::function<void()> work) {
  {
    const std::scoped_lock lock(state_->mutex);
    state_->waiting.push_back(std::move(work));
    if (state_->running == state_->mostAtOnce) return;
    ++state_->running;
  }
  ThreadPool::shared().submit([state = state_] { state->work(); });
}

void OperationQueue::drain() {
  std::unique_lock lock(state_->mutex);
  state_->isIdle.wait(lock, [this] { return state_->running == 0; });
}

}  // namespace mirabel
