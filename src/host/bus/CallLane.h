#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace mirabel::bus {

/// Runs calls of one kind: few of one caller at a time, callers in turn, on a fixed number of
/// threads. So no caller waits for all that another has asked for. Any thread may call it.
class CallLane {
 public:
  struct Limits {
    std::size_t threads;
    std::size_t mostRunning;       ///< calls of one caller at a time
    std::size_t mostWaiting;       ///< calls that a caller may have waiting
    std::size_t mostFilesWaiting;  ///< those among them that hold a file open meanwhile
    std::size_t mostBytesWaiting;  ///< that they hold together
  };
  explicit CallLane(Limits limits);
  ~CallLane() { end(); }
  CallLane(const CallLane&) = delete;
  CallLane& operator=(const CallLane&) = delete;

  /// Takes no further calls and waits for those that run on its threads; those that wait are
  /// dropped.
  void end();

  /// A call runs for as long as somebody keeps its turn, which may be longer than it takes itself.
  /// No turn may outlive the lane.
  using Call = std::function<void(std::shared_ptr<void> turn)>;
  /// What a call holds while it waits.
  struct Holds {
    std::size_t bytes = 0;
    bool isFile = false;
  };
  /// False, and nothing is run, where the caller has too many waiting, or the lane has ended.
  [[nodiscard]] bool submit(const std::string& caller, Call call, Holds holds);
  /// Drops what of that caller waits.
  void forget(const std::string& caller);

 private:
  struct Submitted {
    Call call;
    Holds holds;
  };
  struct Waiting {
    std::deque<Submitted> calls;
    std::size_t files = 0;  ///< that the calls hold
    std::size_t bytes = 0;
    std::size_t running = 0;
    bool isInTurn = false;  ///< whether it stands among the turns
  };
  void run();
  void finish(const std::string& caller);
  void queueIfItCanRun(const std::string& caller, Waiting& waiting);

  const Limits limits_;
  std::mutex mutex_;
  std::condition_variable wake_;
  bool mustEnd_ = false;
  std::map<std::string, Waiting> waiting_;
  std::deque<std::string> turns_;  ///< callers of whom a call can run
  std::vector<std::thread> threads_;
};

}  // namespace mirabel::bus
