#pragma once

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <sys/eventfd.h>
#include <unistd.h>

#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Wakes a thread that polls descriptors, to have it stop for one. Any thread may call it; several
/// calls before it is cleared are one. It works also where the process may have no further
/// descriptors, a second late.
class WakeUp {
 public:
  WakeUp() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

  /// Readable since it was set; -1 where there is none.
  [[nodiscard]] int descriptor() const { return event_.get(); }
  /// How many milliseconds may be polled for, of as many as are wanted (-1: without a limit),
  /// before `isSet` is to be asked.
  [[nodiscard]] int limited(int milliseconds) const {
    if (event_) return milliseconds;
    return milliseconds < 0 ? longestUnheard : std::min(milliseconds, longestUnheard);
  }
  [[nodiscard]] bool isSet() const { return isSet_; }

  void set() {
    isSet_ = true;
    const std::uint64_t one = 1;
    static_cast<void>(!::write(event_.get(), &one, sizeof(one)));
  }
  void clear() {
    std::uint64_t count = 0;
    static_cast<void>(!::read(event_.get(), &count, sizeof(count)));
    isSet_ = false;
  }

 private:
  static constexpr int longestUnheard = 1000;

  UniqueFd event_;
  std::atomic<bool> isSet_ = false;
};

}  // namespace mirabel
