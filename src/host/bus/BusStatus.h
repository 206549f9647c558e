#pragma once

#include <sdbus-c++/Message.h>
#include <vector>

#include "mirabel/Documents.h"
#include "mirabel/StatusReport.h"

namespace mirabel::bus {

// What the manager's interface tells, as it goes over the bus.

/// a{sv} with the names of the members as keys.
void write(sdbus::Message& message, const StatusReport& status);
[[nodiscard]] StatusReport readStatus(sdbus::Message& message);

/// a(say(xu)): identifiers, empty for what has none, paths, and dates.
void write(sdbus::Message& message, const std::vector<TrashedItem>& items);
[[nodiscard]] std::vector<TrashedItem> readTrashedItems(sdbus::Message& message);

}  // namespace mirabel::bus
