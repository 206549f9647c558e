#pragma once

#include <memory>
#include <optional>
#include <string>

#include "cli/Running.h"

namespace mirabel::testing {

/// A session bus that nobody else is on, and that starts nothing by itself. While it lives, it is
/// the session bus of this process and of those that it starts. Other users may connect too.
class PrivateBus {
 public:
  /// Whether this machine has the program that it takes.
  [[nodiscard]] static bool isPossible();

  PrivateBus();
  ~PrivateBus();
  PrivateBus(const PrivateBus&) = delete;
  PrivateBus& operator=(const PrivateBus&) = delete;

 private:
  std::string folder_;
  std::optional<std::string> addressBefore_;
  std::unique_ptr<Running> daemon_;
};

}  // namespace mirabel::testing
