#pragma once

#include <exception>
#include <sdbus-c++/Error.h>
#include <utility>

#include "mirabel/Error.h"

namespace mirabel::bus {

/// The error as a caller on the bus gets it. Its name, below "com.norvane.Vessel1.Error.", says
/// domain and code: "NoSuchItem", "SyncAnchorExpired", "FileExists", "POSIX.ENOSPC"; its message is
/// what a person is told.
[[nodiscard]] sdbus::Error errorForBus(const Error& error);

/// The way back: domain and code, and the message as the explanation. POSIX ENOTCONN where the
/// service has left the bus or does not answer, EACCES where the bus or the service refuses.
[[nodiscard]] Error errorFromBus(const sdbus::Error& error);

/// A handler for a connection: the library answers errors of its own kind, and has no other
/// exception come to an end; there is C in between. So these become such an error.
template <class Handler>
[[nodiscard]] auto guarded(Handler handler) {
  return [handler = std::move(handler)](auto&&... arguments) {
    try {
      return handler(std::forward<decltype(arguments)>(arguments)...);
    } catch (const sdbus::Error&) {
      throw;
    } catch (const std::exception& exception) {
      throw sdbus::Error("org.freedesktop.DBus.Error.Failed", exception.what());
    }
  };
}

}  // namespace mirabel::bus
