#pragma once

#include <cstdint>
#include <sys/eventfd.h>
#include <unistd.h>

#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Wakes a thread that waits for descriptors. Any thread may call it; several calls before it is
/// cleared are one.
class WakeUp {
 public:
  WakeUp() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

  /// Readable since it was set; -1 where the process may have no further descriptors.
  [[nodiscard]] int descriptor() const { return event_.get(); }
  void set() const {
    const std::uint64_t one = 1;
    static_cast<void>(!::write(event_.get(), &one, sizeof(one)));
  }
  void clear() const {
    std::uint64_t count = 0;
    static_cast<void>(!::read(event_.get(), &count, sizeof(count)));
  }

 private:
  UniqueFd event_;
};

}  // namespace mirabel
