#pragma once

#include <sdbus-c++/Error.h>

#include "mirabel/Error.h"

namespace mirabel::bus {

/// The error as a caller on the bus gets it. Its name, below "com.norvane.Vessel1.Error.", says
/// domain and code: "NoSuchItem", "SyncAnchorExpired", "FileExists", "POSIX.ENOSPC"; its message is
/// what a person is told.
[[nodiscard]] sdbus::Error errorForBus(const Error& error);

/// The way back: domain and code, and the message as the explanation. POSIX ENOTCONN where the
/// service has left the bus or does not answer, EACCES where the bus or the service refuses.
[[nodiscard]] Error errorFromBus(const sdbus::Error& error);

}  // namespace mirabel::bus
