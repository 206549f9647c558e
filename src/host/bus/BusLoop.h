#pragma once

#include <functional>
#include <thread>

namespace sdbus {
class IConnection;
}

namespace mirabel::bus {

/// Drives a connection on a thread of its own, and outlives the bus: where that goes away, it says
/// so and drives no more.
class BusLoop {
 public:
  /// The connection outlives it. `lost` is called on that thread, at most once.
  BusLoop(sdbus::IConnection& connection, std::function<void()> lost);
  ~BusLoop() { end(); }
  BusLoop(const BusLoop&) = delete;
  BusLoop& operator=(const BusLoop&) = delete;

  /// Drives no more, and waits for what the thread is at. Not on that thread, nor on two.
  void end();

  /// Whether the caller is on that thread, where nothing that has yet to come can be waited for.
  [[nodiscard]] bool isOnItsThread() const {
    return std::this_thread::get_id() == thread_.get_id();
  }

 private:
  sdbus::IConnection& connection_;
  std::thread thread_;
};

}  // namespace mirabel::bus
