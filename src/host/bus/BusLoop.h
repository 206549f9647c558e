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
  ~BusLoop();
  BusLoop(const BusLoop&) = delete;
  BusLoop& operator=(const BusLoop&) = delete;

  /// Whether the caller is on that thread, where nothing that has yet to come can be waited for.
  [[nodiscard]] bool isOnItsThread() const {
    return std::this_thread::get_id() == thread_.get_id();
  }

 private:
  sdbus::IConnection& connection_;
  std::thread thread_;
};

}  // namespace mirabel::bus
