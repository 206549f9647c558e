#pragma once

#include <functional>
#include <memory>
#include <string>

#include "foundation/ThreadPool.h"

namespace mirabel {

/// Runs blocks one at a time in the order in which they came, on threads borrowed from a pool: an
/// idle queue costs no thread. A handle; copies are the same queue. Blocks that were submitted
/// run even when the last handle goes away first. The pool outlives the work of the queue. Any
/// thread may call.
class SerialQueue {
 public:
  explicit SerialQueue(std::string label, ThreadPool& pool = ThreadPool::shared());

  /// Runs `block` after everything before it, and destroys it before the next block begins. A
  /// block that throws ends the process.
  void async(std::function<void()> block);
  /// Runs `block` after everything before it, on the calling thread, and returns when it is done;
  /// what it throws comes out here. On an idle queue that is at once. Calling it from a block of
  /// the same queue is fatal (a deadlock).
  void sync(const std::function<void()>& block);
  /// The same, and what is submitted in the meantime runs on the calling thread too, until nothing
  /// is left or another caller of `sync` comes next: for who waits for what follows from `block`,
  /// without waking others for it. `block` must not throw.
  void syncWithWhatFollows(const std::function<void()>& block);

  /// Whether the calling code is a block of this queue, or was called by `sync` of another queue
  /// from such a block.
  [[nodiscard]] bool isCurrent() const;
  /// Fatal when the calling code is not running on this queue.
  void assertOnQueue() const;
  [[nodiscard]] const std::string& label() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
