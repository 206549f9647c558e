#pragma once

#include <chrono>

#include "mirabel/Values.h"

namespace mirabel {

/// Time as the logic sees it. Any thread may call it.
class Clock {
 public:
  virtual ~Clock() = default;
  [[nodiscard]] virtual Date now() = 0;
  virtual void sleep(std::chrono::milliseconds duration) = 0;
};

}  // namespace mirabel
