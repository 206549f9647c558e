#pragma once

#include <functional>
#include <string>
#include <sys/types.h>

#include "host/bus/BusClient.h"

namespace mirabel::testing {

/// Runs `body` in a process of its own whose root holds what a sandbox says of itself, with a
/// client that came onto the bus before. Its failures are failures of the test. False where this
/// machine does not let a process have a root of its own.
[[nodiscard]] bool inSandbox(const std::string& flatpakInfo,
                             const std::function<void(BusClient& client)>& body);
/// The same as another user. Needs root.
void asUser(uid_t user, const std::function<void(BusClient& client)>& body);

}  // namespace mirabel::testing
