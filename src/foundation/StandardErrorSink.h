#pragma once

#include <cstdio>
#include <string_view>

#include "foundation/Log.h"

namespace mirabel {

/// Writes each line, with a newline, in one piece, so that lines of several threads and processes
/// do not mix within a line. Failures to write are ignored. Any thread.
class StandardErrorSink : public LogSink {
 public:
  /// `file` stays the caller's, and outlives the sink.
  explicit StandardErrorSink(std::FILE* file = stderr) : file_(file) {}

  void write(LogLevel level, std::string_view subsystem, std::string_view category,
             std::string_view line) override;

 private:
  std::FILE* file_;
};

}  // namespace mirabel
