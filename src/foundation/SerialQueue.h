#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "foundation/ThreadPool.h"

namespace mirabel {

/// Runs blocks one at a time in the order in which they came, on threads borrowed from a pool: an
/// idle queue costs no thread. A handle; copies are the same queue. Blocks that were submitted
/// run even when the last handle goes away first.
class SerialQueue {
 public:
  explicit SerialQueue(std::string label, ThreadPool& pool = ThreadPool::shared());

  void async(std::function<void()> block);
  /// Runs `block` after everything before it and returns when it is done. On an idle queue it
  /// runs on the calling thread. Calling it from a block of the same queue is fatal (a deadlock).
  void sync(const std::function<void()>& block);

  [[nodiscard]] bool isCurrent() const;
  /// Fatal when the calling code is not running on this queue.
  void assertOnQueue() const;
  [[nodiscard]] const std::string& label() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

/// Counts work that was started elsewhere and tells when all of it has ended. A handle; copies
/// are the same group.
class DispatchGroup {
 public:
  DispatchGroup();

  void enter();
  /// One call per `enter`; one too many is fatal.
  void leave();
  /// Whether the count reached zero before the time was up.
  [[nodiscard]] bool wait(std::chrono::milliseconds timeout);
  void wait();
  /// Submits `block` to `queue` once the count is zero; at once when it is zero now.
  void notify(SerialQueue queue, std::function<void()> block);

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
