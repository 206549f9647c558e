#pragma once

#include <functional>
#include <memory>
#include <string>

#include "host/LocalDocuments.h"
#include "mirabel/Error.h"

namespace mirabel::bus {

/// The service on the session bus: answers the calls of other programs with the documents of this
/// process. Calls are read on one thread. What needs no waiting is answered there, the rest on
/// other threads, so that none holds up another.
class BusService {
 public:
  /// Takes the service's name. `documents` outlives the service's calls: until `stop` has returned.
  /// `lost` is called when the bus has gone away, on a thread of the service.
  /// Errors: POSIX ENOTCONN where there is no session bus; EADDRINUSE where another service has the
  /// name.
  [[nodiscard]] static Result<std::unique_ptr<BusService>> start(LocalDocuments& documents,
                                                                 std::function<void()> lost);
  ~BusService();
  BusService(const BusService&) = delete;
  BusService& operator=(const BusService&) = delete;

  /// Gives the name back and ends what is kept for callers; calls that run are answered. Operations
  /// that have begun report to the service all the same: it has to live until the documents are
  /// gone.
  void stop();

 private:
  class Impl;
  explicit BusService(std::unique_ptr<Impl> impl);
  std::unique_ptr<Impl> impl_;
};

}  // namespace mirabel::bus
