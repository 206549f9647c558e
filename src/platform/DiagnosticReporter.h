#pragma once

#include <string_view>

namespace mirabel {

/// Where a process that keeps running files a report of something that should not have happened,
/// as if it had crashed there. Any thread may call it; it does not block.
class DiagnosticReporter {
 public:
  virtual ~DiagnosticReporter() = default;
  virtual void report(std::string_view text) = 0;
};

}  // namespace mirabel
