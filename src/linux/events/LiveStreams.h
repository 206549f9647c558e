#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include "linux/volume/JournalBell.h"

namespace mirabel {

/// A stream that has delivered its history and waits for more.
class LiveStream {
 public:
  virtual ~LiveStream() = default;
  /// How long it gathers events before it delivers them.
  [[nodiscard]] virtual std::chrono::milliseconds latency() const = 0;
  /// Has what there is by now delivered on the stream's queue. Returns at once.
  virtual void submit() = 0;
};

/// Has live streams deliver what is new, each under its latency: the first event after a delivery
/// starts its time, and what comes before that is over goes with it. Nothing queues but the fact
/// that there is something. Any thread may call it.
class LiveStreams {
 public:
  /// `bell` outlives it; it is listened to from the first stream on.
  explicit LiveStreams(JournalBell& bell) : bell_(bell) {}
  ~LiveStreams();
  LiveStreams(const LiveStreams&) = delete;
  LiveStreams& operator=(const LiveStreams&) = delete;

  /// From now on it is told of what comes. It is let go of when its owner does.
  void add(std::weak_ptr<LiveStream> stream);

 private:
  using Clock = std::chrono::steady_clock;
  struct Waiting {
    std::weak_ptr<LiveStream> stream;
    Clock::time_point due = Clock::time_point::max();
  };
  void grown();
  void run();
  [[nodiscard]] Clock::time_point nextDue() const;
  [[nodiscard]] std::vector<std::shared_ptr<LiveStream>> takeDue(Clock::time_point now);

  JournalBell& bell_;
  std::once_flag listens_;
  std::uint64_t listener_ = 0;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<Waiting> streams_;
  bool isClosed_ = false;
  std::thread thread_;  // when there are streams
};

}  // namespace mirabel
