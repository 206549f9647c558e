#include "linux/log/JournalSink.h"

#include <cerrno>
#include <cstddef>
#include <sys/uio.h>

// Without this every entry would name a line of this file as the place that it came from.
#define SD_JOURNAL_SUPPRESS_LOCATION
#include <systemd/sd-journal.h>

namespace mirabel {
namespace {

std::string_view priorityOf(LogLevel level) {
  switch (level) {
    case LogLevel::debug:
      return "7";
    case LogLevel::info:
      return "6";
    case LogLevel::error:
      return "3";
  }
  return "6";
}

std::string field(std::string_view name, std::string_view value) {
  std::string text;
  text.reserve(name.size() + 1 + value.size());
  text.append(name).append(1, '=').append(value);
  return text;
}

}  // namespace

std::array<std::string, 5> journalFields(LogLevel level, std::string_view subsystem,
                                         std::string_view category, std::string_view line) {
  return {field("MESSAGE", line), field("PRIORITY", priorityOf(level)),
          field("SUBSYSTEM", subsystem), field("CATEGORY", category),
          field("SYSLOG_IDENTIFIER", "mirabel")};
}

void JournalSink::write(LogLevel level, std::string_view subsystem, std::string_view category,
                        std::string_view line) {
  std::array<std::string, 5> fields = journalFields(level, subsystem, category, line);
  std::array<iovec, 5> vectors;
  for (std::size_t i = 0; i < fields.size(); ++i) {
    vectors[i] = {fields[i].data(), fields[i].size()};
  }
  // A line that the journal does not take is lost: there is nobody left to tell.
  const int savedErrno = errno;
  static_cast<void>(sd_journal_sendv(vectors.data(), static_cast<int>(vectors.size())));
  errno = savedErrno;
}

}  // namespace mirabel
