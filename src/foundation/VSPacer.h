#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>

#include "foundation/SerialQueue.h"

namespace mirabel {

/// What a pacer measures its intervals with. Thread-safe.
class PacerClock {
 public:
  using Time = std::chrono::steady_clock::time_point;

  virtual ~PacerClock() = default;
  [[nodiscard]] virtual Time now() = 0;
  /// Waits until `changed` is notified or that time has come; it may return earlier.
  virtual void waitUntil(Time time, std::condition_variable& changed,
                         std::unique_lock<std::mutex>& lock) = 0;
  /// The time that passes.
  [[nodiscard]] static PacerClock& steady();
};

/// Runs a block on a queue when it is signalled, however often that is: signals that come while a
/// run is pending are merged into it, and two runs never start less than the minimum interval
/// apart. The first signal after a rest runs at once. Any thread may call it.
class VSPacer {
 public:
  using EventBlock = std::function<void()>;

  /// The clock outlives it.
  VSPacer(std::string name, SerialQueue queue, std::chrono::milliseconds minimumFireInterval,
          PacerClock& clock = PacerClock::steady());
  /// Drops what is pending, and waits for a run that is under way: so not from the block.
  ~VSPacer();
  VSPacer(const VSPacer&) = delete;
  VSPacer& operator=(const VSPacer&) = delete;

  /// Before `resume`.
  void setEventBlock(EventBlock block);
  /// From now on signals are acted on, one that came before among them.
  void resume();
  void signal();
  /// Signals when that time has passed, unless a run has begun by then.
  void signalAfter(std::chrono::milliseconds delay);
  /// Returns when a run was done that began after the signals before this call; at once when
  /// nothing is pending; what is signalled for later is not pending before. Not from the block, and
  /// not before `resume`.
  void waitUntilIdle();

  [[nodiscard]] const std::string& name() const;

 private:
  struct State;
  std::unique_ptr<State> state_;
};

}  // namespace mirabel
