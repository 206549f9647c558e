#include "host/bus/BusLoop.h"

#include <exception>
#include <sdbus-c++/sdbus-c++.h>
#include <string>
#include <utility>

#include "foundation/Log.h"

namespace mirabel::bus {

BusLoop::BusLoop(sdbus::IConnection& connection, std::function<void()> lost)
    : connection_(connection), thread_([&connection, lost = std::move(lost)] {
        try {
          connection.enterEventLoop();
        } catch (const std::exception& error) {
          logError(std::string("can't go on with the bus; ") + error.what());
          lost();
        }
      }) {}

void BusLoop::end() {
  if (!thread_.joinable()) return;
  connection_.leaveEventLoop();
  thread_.join();
}

}  // namespace mirabel::bus
