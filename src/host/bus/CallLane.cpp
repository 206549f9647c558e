#include "host/bus/CallLane.h"

#include <exception>
#include <utility>

#include "foundation/Log.h"

namespace mirabel::bus {

CallLane::CallLane(std::size_t threads, std::size_t mostWaiting) : mostWaiting_(mostWaiting) {
  for (std::size_t i = 0; i < threads; ++i)
    threads_.emplace_back([this] { run(); });
}

void CallLane::end() {
  std::map<std::string, Waiting> dropped;  // let go of without the lock
  {
    const std::lock_guard lock(mutex_);
    mustEnd_ = true;
  }
  wake_.notify_all();
  for (std::thread& thread : threads_)
    thread.join();
  threads_.clear();
  const std::lock_guard lock(mutex_);
  dropped.swap(waiting_);
}

bool CallLane::submit(const std::string& caller, std::function<void()> call) {
  {
    const std::lock_guard lock(mutex_);
    if (mustEnd_) return false;
    Waiting& waiting = waiting_[caller];
    if (waiting.calls.size() >= mostWaiting_) return false;
    waiting.calls.push_back(std::move(call));
    if (waiting.isRunning || waiting.calls.size() > 1) return true;
    turns_.push_back(caller);
  }
  wake_.notify_one();
  return true;
}

void CallLane::forget(const std::string& caller) {
  std::deque<std::function<void()>> dropped;  // let go of without the lock
  const std::lock_guard lock(mutex_);
  const auto found = waiting_.find(caller);
  if (found == waiting_.end()) return;
  dropped.swap(found->second.calls);
  if (!found->second.isRunning) waiting_.erase(found);
}

void CallLane::run() {
  std::unique_lock lock(mutex_);
  while (true) {
    wake_.wait(lock, [this] { return mustEnd_ || !turns_.empty(); });
    if (mustEnd_) return;
    const std::string caller = std::move(turns_.front());
    turns_.pop_front();
    const auto found = waiting_.find(caller);
    if (found == waiting_.end() || found->second.calls.empty()) continue;
    std::function<void()> call = std::move(found->second.calls.front());
    found->second.calls.pop_front();
    found->second.isRunning = true;
    lock.unlock();
    try {
      call();
    } catch (const std::exception& exception) {
      // No memory for one answer is no reason to give none to others; the call answers that it was
      // given up.
      logError(std::string("can't answer a call; ") + exception.what());
    }
    call = {};
    lock.lock();
    found->second.isRunning = false;
    if (found->second.calls.empty()) {
      waiting_.erase(found);
    } else {
      turns_.push_back(caller);
      wake_.notify_one();
    }
  }
}

}  // namespace mirabel::bus
