#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace mirabel::bus {

/// Runs calls of one kind: those of one caller one after the other, callers in turn, on a fixed
/// number of threads. So no caller waits for all that another has asked for. Any thread may call
/// it.
class CallLane {
 public:
  /// `mostWaiting`: calls that a caller may have waiting.
  CallLane(std::size_t threads, std::size_t mostWaiting);
  ~CallLane() { end(); }
  CallLane(const CallLane&) = delete;
  CallLane& operator=(const CallLane&) = delete;

  /// Takes no further calls and waits for those that run; those that wait are dropped.
  void end();

  /// False, and nothing is run, where the caller has too many waiting, or the lane has ended.
  [[nodiscard]] bool submit(const std::string& caller, std::function<void()> call);
  /// Drops what of that caller waits.
  void forget(const std::string& caller);

 private:
  struct Waiting {
    std::deque<std::function<void()>> calls;
    bool isRunning = false;
  };
  void run();

  const std::size_t mostWaiting_;
  std::mutex mutex_;
  std::condition_variable wake_;
  bool mustEnd_ = false;
  std::map<std::string, Waiting> waiting_;
  std::deque<std::string> turns_;  ///< callers of whom a call can run
  std::vector<std::thread> threads_;
};

}  // namespace mirabel::bus
