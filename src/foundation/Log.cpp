#include "foundation/Log.h"

#include <mutex>
#include <utility>

#include "foundation/StandardErrorSink.h"

namespace mirabel {
namespace {

constexpr std::string_view subsystem = "com.norvane.Vessel";
constexpr std::string_view category = "mirabel";

std::string_view prefixOf(LogLevel level) {
  switch (level) {
    case LogLevel::debug:
      return "[DEBUG] ";
    case LogLevel::info:
      return "[INFO] ";
    case LogLevel::error:
      return "[ERROR] ";
  }
  return {};
}

}  // namespace

struct Log::State {
  std::mutex mutex;
  std::shared_ptr<LogSink> sink = std::make_shared<StandardErrorSink>();
};

Log::Log() : threshold_(LogLevel::error), state_(std::make_unique<State>()) {}

Log& Log::shared() {
  // Never destroyed: threads and static objects may log while the process ends.
  static Log* const log = new Log;
  return *log;
}

void Log::setSink(std::shared_ptr<LogSink> sink, LogLevel threshold) {
  if (sink == nullptr) {
    sink = std::make_shared<StandardErrorSink>();
    threshold = LogLevel::error;
  }
  {
    const std::lock_guard lock(state_->mutex);
    std::swap(state_->sink, sink);
    threshold_.store(threshold, std::memory_order_relaxed);
  }
  // The former sink goes here, outside the lock: it may log while it is being destroyed.
}

void Log::plain(LogLevel level, std::string_view line) {
  if (!isEnabled(level)) return;
  std::shared_ptr<LogSink> sink;
  {
    const std::lock_guard lock(state_->mutex);
    sink = state_->sink;
  }
  sink->write(level, subsystem, category, line);
}

void logMessage(LogLevel level, std::string_view message) {
  Log& log = Log::shared();
  if (!log.isEnabled(level)) return;
  const std::string_view prefix = prefixOf(level);
  std::string line;
  line.reserve(prefix.size() + message.size());
  line.append(prefix).append(message);
  log.plain(level, line);
}

void logDebug(std::string_view message) {
  logMessage(LogLevel::debug, message);
}
void logInfo(std::string_view message) {
  logMessage(LogLevel::info, message);
}
void logError(std::string_view message) {
  logMessage(LogLevel::error, message);
}

std::string quoted(std::string_view text) {
  std::string line;
  line.reserve(text.size() + 2);
  line.append(1, '"').append(text).append(1, '"');
  return line;
}

}  // namespace mirabel
