#pragma once

#include <string_view>

#include "foundation/Log.h"

namespace mirabel {

/// Writes each line, with a newline, to a file descriptor in one call, so that lines of several
/// threads and processes do not mix within a line. Failures to write are ignored. Any thread.
class StandardErrorSink : public LogSink {
 public:
  /// `descriptor` stays the caller's; 2 is standard error.
  explicit StandardErrorSink(int descriptor = 2) : descriptor_(descriptor) {}

  void write(LogLevel level, std::string_view subsystem, std::string_view category,
             std::string_view line) override;

 private:
  int descriptor_;
};

}  // namespace mirabel
