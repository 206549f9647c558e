#include <limits>
#include <string>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "foundation/LogSectionCounter.h"
#include "mirabel/Error.h"

namespace mirabel {

LogSectionCounter::LogSectionCounter(std::uint64_t first)
    : queue_("mirabel.log-section"), next_(first) {}

LogSectionCounter& LogSectionCounter::shared() {
  // Never destroyed, like the log that its numbers go to.
  static LogSectionCounter* const counter = new LogSectionCounter;
  return *counter;
}

std::uint64_t LogSectionCounter::draw() {
  std::uint64_t number = 0;
  queue_.sync([&] {
    number = next_;
    if (next_ == std::numeric_limits<std::uint64_t>::max()) fatalError("log sections are used up");
    ++next_;
  });
  return number;
}

LogSection::LogSection(std::string_view label) : number_(LogSectionCounter::shared().draw()) {
  logDebug([&] { return "┏" + std::to_string(number_) + " " + std::string(label); });
}

LogSection::~LogSection() {
  logDebug([&] { return "┗" + std::to_string(number_); });
}

}  // namespace mirabel
