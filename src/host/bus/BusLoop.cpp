#include "host/bus/BusLoop.h"

#include <sdbus-c++/sdbus-c++.h>
#include <utility>

#include "foundation/Log.h"

namespace mirabel::bus {

BusLoop::BusLoop(sdbus::IConnection& connection, std::function<void()> lost)
    : connection_(connection), thread_([&connection, lost = std::move(lost)] {
        try {
          connection.enterEventLoop();
        } catch (const sdbus::Error& error) {
          logError("can't go on with the bus; " + error.getMessage());
          lost();
        }
      }) {}

BusLoop::~BusLoop() {
  connection_.leaveEventLoop();
  if (thread_.joinable()) thread_.join();
}

}  // namespace mirabel::bus
