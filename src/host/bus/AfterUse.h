#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <thread>

namespace mirabel::bus {

/// Does something on a thread of its own when what was used has been left alone for a while, or,
/// where it never is, when it was used for long. Without use it does nothing, and never wakes.
class AfterUse {
 public:
  struct Times {
    std::chrono::milliseconds quiet;
    std::chrono::milliseconds longest;
  };
  AfterUse(Times times, std::function<void()> work);
  ~AfterUse() { end(); }
  AfterUse(const AfterUse&) = delete;
  AfterUse& operator=(const AfterUse&) = delete;

  /// Any thread, also when it has ended; costs next to nothing.
  void used();
  /// Waits for the work that is being done; what is still to be done is not. Not for two threads.
  void end();

 private:
  void run();
  [[nodiscard]] bool awaitUse();
  [[nodiscard]] bool awaitQuiet();

  const Times times_;
  const std::function<void()> work_;
  std::atomic<bool> isUsed_ = false;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool mustEnd_ = false;
  std::thread thread_;
};

}  // namespace mirabel::bus
