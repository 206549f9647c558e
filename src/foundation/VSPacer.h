#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "foundation/SerialQueue.h"

namespace mirabel {

/// Runs a block on a queue when it is signalled, however often that is: signals that come while a
/// run is pending are merged into it, and two runs never start less than the minimum interval
/// apart. The first signal after a rest runs at once. Any thread may call it.
class VSPacer {
 public:
  using EventBlock = std::function<void()>;

  VSPacer(std::string name, SerialQueue queue, std::chrono::milliseconds minimumFireInterval);
  /// Drops what is pending, and waits for a run that is under way: so not from the block.
  ~VSPacer();
  VSPacer(const VSPacer&) = delete;
  VSPacer& operator=(const VSPacer&) = delete;

  /// Before `resume`.
  void setEventBlock(EventBlock block);
  /// From now on signals are acted on, one that came before among them.
  void resume();
  void signal();
  /// Returns when a run was done that began after the signals before this call; at once when
  /// nothing is pending. Not from the block, and not before `resume`.
  void waitUntilIdle();

  [[nodiscard]] const std::string& name() const;

 private:
  struct State;
  std::unique_ptr<State> state_;
};

}  // namespace mirabel
