#pragma once

#include <cstddef>
#include <functional>
#include <memory>

namespace mirabel {

/// Runs pieces of work on borrowed threads, at most so many at once and the rest in their order.
/// Any thread may add to it; the destructor waits for all that was added.
class OperationQueue {
 public:
  explicit OperationQueue(std::size_t mostAtOnce);
  ~OperationQueue();
  OperationQueue(const OperationQueue&) = delete;
  OperationQueue& operator=(const OperationQueue&) = delete;

  void add(std::function<void()> work);
  /// Waits until nothing is left to do.
  void drain();

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
