#pragma once

#include <array>
#include <string>
#include <string_view>

#include "foundation/Log.h"

namespace mirabel {

/// Sends lines to the machine's journal. Where no journal runs they go nowhere; nothing fails and
/// nothing blocks on it being there. Any thread.
class JournalSink : public LogSink {
 public:
  void write(LogLevel level, std::string_view subsystem, std::string_view category,
             std::string_view line) override;
};

/// A line as the journal keeps it, one "NAME=value" each: MESSAGE (newlines and all), PRIORITY
/// (debug 7, info 6, error 3), SUBSYSTEM, CATEGORY and SYSLOG_IDENTIFIER, which is "mirabel".
[[nodiscard]] std::array<std::string, 5> journalFields(LogLevel level, std::string_view subsystem,
                                                       std::string_view category,
                                                       std::string_view line);

}  // namespace mirabel
