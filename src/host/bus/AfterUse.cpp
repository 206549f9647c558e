#include "host/bus/AfterUse.h"

#include <algorithm>
#include <utility>

namespace mirabel::bus {

AfterUse::AfterUse(Times times, std::function<void()> work)
    : times_(times), work_(std::move(work)), thread_([this] { run(); }) {}

void AfterUse::end() {
  if (!thread_.joinable()) return;
  {
    const std::lock_guard lock(mutex_);
    mustEnd_ = true;
  }
  changed_.notify_one();
  thread_.join();
}

void AfterUse::used() {
  if (isUsed_.exchange(true)) return;
  // With the lock, so that it is not between a look and a wait that it is told.
  const std::lock_guard lock(mutex_);
  changed_.notify_one();
}

void AfterUse::run() {
  while (awaitUse() && awaitQuiet())
    work_();
}

/// False when it is to end.
bool AfterUse::awaitUse() {
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [this] { return mustEnd_ || isUsed_; });
  return !mustEnd_;
}

/// The same.
bool AfterUse::awaitQuiet() {
  const auto latest = std::chrono::steady_clock::now() + times_.longest;
  std::unique_lock lock(mutex_);
  while (!mustEnd_ && isUsed_.exchange(false) && std::chrono::steady_clock::now() < latest) {
    const auto quiet = std::chrono::steady_clock::now() + times_.quiet;
    changed_.wait_until(lock, std::min(quiet, latest), [this] { return mustEnd_; });
  }
  return !mustEnd_;
}

}  // namespace mirabel::bus
