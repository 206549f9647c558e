#pragma once

#include <cstdint>

#include "foundation/SerialQueue.h"

namespace mirabel {

/// Where sections draw their numbers: consecutive, each given out once, drawn on the serial queue
/// "mirabel.log-section". Any thread.
class LogSectionCounter {
 public:
  explicit LogSectionCounter(std::uint64_t first = 0);
  LogSectionCounter(const LogSectionCounter&) = delete;
  LogSectionCounter& operator=(const LogSectionCounter&) = delete;

  /// The process's one counter, which starts at 0.
  static LogSectionCounter& shared();

  /// Fatal once the numbers are used up.
  [[nodiscard]] std::uint64_t draw();

 private:
  SerialQueue queue_;
  std::uint64_t next_;  // on queue_
};

}  // namespace mirabel
