#pragma once

#include <thread>

#include "platform/Platform.h"

namespace mirabel {

/// The machine's clock.
class SystemClock final : public Clock {
 public:
  Date now() override { return Date::now(); }
  void sleep(std::chrono::milliseconds duration) override { std::this_thread::sleep_for(duration); }
};

}  // namespace mirabel
