#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace mirabel {

class SerialQueue;

/// Counts work that was started elsewhere and tells when all of it has ended. A handle; copies
/// are the same group. Any thread may call; a group may be used again once its count is zero.
class DispatchGroup {
 public:
  DispatchGroup();

  void enter();
  /// One call per `enter`; one too many is fatal.
  void leave();
  /// Whether the count was zero at some moment before the time was up.
  [[nodiscard]] bool wait(std::chrono::milliseconds timeout);
  void wait();
  /// Submits `block` to `queue`, once, when the count becomes zero; at once when it is zero now.
  void notify(SerialQueue queue, std::function<void()> block);

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
