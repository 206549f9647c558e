#include "support/LogCapture.h"

#include <mutex>
#include <ostream>
#include <utility>

namespace mirabel::testing {
namespace {

constexpr std::string_view opening = "[DEBUG] ┏";
constexpr std::string_view closing = "[DEBUG] ┗";

}  // namespace

std::ostream& operator<<(std::ostream& out, const LogLine& line) {
  constexpr const char* names[] = {"debug", "info", "error"};
  return out << names[static_cast<int>(line.level)] << ": " << line.text;
}

class LogCapture::Sink : public LogSink {
 public:
  void write(LogLevel level, std::string_view, std::string_view, std::string_view line) override {
    const std::lock_guard lock(mutex_);
    lines_.push_back({level, std::string(line)});
  }
  std::vector<LogLine> lines() const {
    const std::lock_guard lock(mutex_);
    return lines_;
  }
  void clear() {
    const std::lock_guard lock(mutex_);
    lines_.clear();
  }

 private:
  mutable std::mutex mutex_;
  std::vector<LogLine> lines_;
};

LogCapture::LogCapture(LogLevel threshold) : sink_(std::make_shared<Sink>()) {
  Log::shared().setSink(sink_, threshold);
}

LogCapture::~LogCapture() {
  Log::shared().setSink(nullptr, LogLevel::error);
}

std::vector<LogLine> LogCapture::lines() const {
  return sink_->lines();
}

std::vector<LogLine> LogCapture::messages() const {
  std::vector<LogLine> result = lines();
  std::erase_if(result, [](const LogLine& line) {
    return line.text.starts_with(opening) || line.text.starts_with(closing);
  });
  return result;
}

std::vector<std::string> LogCapture::sectionLabels() const {
  std::vector<std::string> labels;
  for (const LogLine& line : lines()) {
    if (!line.text.starts_with(opening)) continue;
    labels.push_back(line.text.substr(line.text.find(' ', opening.size()) + 1));
  }
  return labels;
}

void LogCapture::clear() {
  sink_->clear();
}

}  // namespace mirabel::testing
