#pragma once

#include <cstdint>
#include <exception>
#include <map>
#include <sdbus-c++/sdbus-c++.h>
#include <string>
#include <utility>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel::bus {

/// An error with what `Error::userInfo` says besides. Callers that have asked for it, see
/// `Caller::describeErrors`, get that as a second argument, "a{say}", behind the message: not all
/// libraries find the message of an error that has two.
class BusError : public sdbus::Error {
 public:
  using Info = std::map<std::string, std::vector<std::uint8_t>>;

  BusError(const sdbus::Error& error, Info info) : sdbus::Error(error), info_(std::move(info)) {}
  [[nodiscard]] const Info& info() const { return info_; }
  /// The error that came with that reply; without information where it holds none.
  [[nodiscard]] static BusError read(sdbus::Message& reply, const sdbus::Error& error);

 private:
  Info info_;
};

/// The error as a caller on the bus gets it. Its name, below "com.norvane.Vessel1.Error.", says
/// domain and code: "NoSuchItem", "SyncAnchorExpired", "FileExists", "POSIX.ENOSPC"; its message is
/// what a person is told.
[[nodiscard]] BusError errorForBus(const Error& error);

/// The way back: domain and code, the information of a `BusError`, and the message as the
/// explanation. POSIX ENOTCONN where the
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
