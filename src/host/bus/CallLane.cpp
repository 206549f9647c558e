#include "host/bus/CallLane.h"

#include <exception>
#include <utility>

#include "foundation/Log.h"

namespace mirabel::bus {

CallLane::CallLane(Limits limits) : limits_(limits) {
  for (std::size_t i = 0; i < limits_.threads; ++i)
    threads_.emplace_back([this] { run(); });
}

void CallLane::end() {
  std::vector<std::deque<Submitted>> dropped;  // let go of without the lock
  {
    const std::lock_guard lock(mutex_);
    mustEnd_ = true;
  }
  wake_.notify_all();
  for (std::thread& thread : threads_)
    thread.join();
  threads_.clear();
  const std::lock_guard lock(mutex_);
  dropped.reserve(waiting_.size());
  for (auto& [caller, waiting] : waiting_)
    dropped.push_back(std::exchange(waiting.calls, {}));
}

bool CallLane::submit(const std::string& caller, Call call, Holds holds) {
  const std::lock_guard lock(mutex_);
  if (mustEnd_) return false;
  Waiting& waiting = waiting_[caller];
  if (waiting.calls.size() >= limits_.mostWaiting) return false;
  if (holds.isFile && waiting.files >= limits_.mostFilesWaiting) return false;
  if (holds.bytes > limits_.mostBytesWaiting - waiting.bytes) return false;
  waiting.calls.push_back({std::move(call), holds});
  if (holds.isFile) ++waiting.files;
  waiting.bytes += holds.bytes;
  queueIfItCanRun(caller, waiting);
  return true;
}

void CallLane::queueIfItCanRun(const std::string& caller, Waiting& waiting) {
  const bool canRun =
      !waiting.isInTurn && !waiting.calls.empty() && waiting.running < limits_.mostRunning;
  if (!canRun) return;
  waiting.isInTurn = true;
  turns_.push_back(caller);
  wake_.notify_one();
}

void CallLane::forget(const std::string& caller) {
  std::deque<Submitted> dropped;  // let go of without the lock
  const std::lock_guard lock(mutex_);
  const auto found = waiting_.find(caller);
  if (found == waiting_.end()) return;
  dropped.swap(found->second.calls);
  found->second.files = 0;
  found->second.bytes = 0;
  if (found->second.running == 0 && !found->second.isInTurn) waiting_.erase(found);
}

void CallLane::finish(const std::string& caller) {
  const std::lock_guard lock(mutex_);
  const auto found = waiting_.find(caller);
  if (found == waiting_.end()) return;
  --found->second.running;
  queueIfItCanRun(caller, found->second);
  const Waiting& waiting = found->second;
  if (waiting.running == 0 && waiting.calls.empty() && !waiting.isInTurn) waiting_.erase(found);
}

void CallLane::run() {
  std::unique_lock lock(mutex_);
  while (true) {
    wake_.wait(lock, [this] { return mustEnd_ || !turns_.empty(); });
    if (mustEnd_) return;
    const std::string caller = std::move(turns_.front());
    turns_.pop_front();
    const auto found = waiting_.find(caller);
    found->second.isInTurn = false;
    if (found->second.calls.empty()) {
      // It was forgotten meanwhile.
      if (found->second.running == 0) waiting_.erase(found);
      continue;
    }
    auto [call, holds] = std::move(found->second.calls.front());
    found->second.calls.pop_front();
    if (holds.isFile) --found->second.files;
    found->second.bytes -= holds.bytes;
    ++found->second.running;
    queueIfItCanRun(caller, found->second);
    lock.unlock();
    try {
      call(std::shared_ptr<void>(nullptr, [this, caller](void*) { finish(caller); }));
    } catch (const std::exception& exception) {
      // No memory for one answer is no reason to give none to others; the call answers that it was
      // given up.
      logError(std::string("can't answer a call; ") + exception.what());
    }
    call = {};
    lock.lock();
  }
}

}  // namespace mirabel::bus
