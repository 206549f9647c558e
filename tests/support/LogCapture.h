#pragma once

#include <iosfwd>
#include <memory>
#include <string>
#include <vector>

#include "foundation/Log.h"

namespace mirabel::testing {

/// A line as it reached the sink, level word included.
struct LogLine {
  LogLevel level = LogLevel::debug;
  std::string text;

  friend bool operator==(const LogLine&, const LogLine&) = default;
  friend std::ostream& operator<<(std::ostream& out, const LogLine& line);
};

/// Records what is logged while it lives, from any thread, and restores the log's start-up state
/// at its end. One at a time.
class LogCapture {
 public:
  explicit LogCapture(LogLevel threshold = LogLevel::debug);
  ~LogCapture();
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;

  /// Everything so far, in the order of arrival.
  [[nodiscard]] std::vector<LogLine> lines() const;
  /// The same without the opening and closing lines of sections, whose numbers depend on what
  /// ran before.
  [[nodiscard]] std::vector<LogLine> messages() const;
  /// The labels of the sections that were opened.
  [[nodiscard]] std::vector<std::string> sectionLabels() const;
  void clear();

 private:
  class Sink;
  std::shared_ptr<Sink> sink_;
};

}  // namespace mirabel::testing
