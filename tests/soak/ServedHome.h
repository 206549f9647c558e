#pragma once

#include <memory>
#include <string>
#include <sys/types.h>

#include "cli/Running.h"
#include "host/bus/PrivateBus.h"

namespace mirabel::testing {

/// The program, serving a home on a bus of its own. Failures throw.
class ServedHome {
 public:
  explicit ServedHome(std::string home) : home_(std::move(home)) { start(); }

  [[nodiscard]] pid_t process() const { return service_->id(); }
  /// Returns when it answers on the bus.
  void start();
  void kill();

 private:
  PrivateBus bus_;
  std::string home_;
  std::unique_ptr<Running> service_;
};

}  // namespace mirabel::testing
