#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace mirabel {

enum class LogLevel { debug, info, error };

/// Where lines go. Called from any thread, one line per call, without a newline at the end.
class LogSink {
 public:
  virtual ~LogSink() = default;
  virtual void write(LogLevel level, std::string_view subsystem, std::string_view category,
                     std::string_view line) = 0;
};

/// What builds a message when it is asked to: a callable whose answer reads as text.
template <class Build>
concept MessageBuilder = requires(Build& build) {
  std::string_view(build());
};

/// The process's one log handle: subsystem "com.norvane.Vessel", category "mirabel". Lines below
/// the threshold cost one relaxed load. Until a sink is set, lines at error level go to standard
/// error and the others nowhere. Any thread; usable until the process is gone.
class Log {
 public:
  static Log& shared();

  [[nodiscard]] bool isEnabled(LogLevel level) const {
    return level >= threshold_.load(std::memory_order_relaxed);
  }
  /// Replaces the sink and the lowest level that reaches it; the former sink is kept alive until
  /// calls that are under way have left it. Null restores the start-up state.
  void setSink(std::shared_ptr<LogSink> sink, LogLevel threshold);

  /// The line as it stands, without a level word.
  void plain(LogLevel level, std::string_view line);
  /// The same for a line that costs something to build.
  template <MessageBuilder Build>
  void plain(LogLevel level, Build&& build) {
    if (isEnabled(level)) plain(level, std::string_view(build()));
  }

 private:
  Log();
  std::atomic<LogLevel> threshold_;
  struct State;
  std::unique_ptr<State> state_;
};

/// "[DEBUG] message", "[INFO] message", "[ERROR] message".
void logDebug(std::string_view message);
void logInfo(std::string_view message);
void logError(std::string_view message);
void logMessage(LogLevel level, std::string_view message);

/// The same for messages that cost something to build: `build` runs only when the level is on.
template <MessageBuilder Build>
void logDebug(Build&& build) {
  if (Log::shared().isEnabled(LogLevel::debug)) logDebug(std::string_view(build()));
}
template <MessageBuilder Build>
void logMessage(LogLevel level, Build&& build) {
  if (Log::shared().isEnabled(level)) logMessage(level, std::string_view(build()));
}

/// What a message is about, in its double quotes.
[[nodiscard]] std::string quoted(std::string_view text);

/// A numbered bracket around a step: writes "[DEBUG] ┏N label" when made and "[DEBUG] ┗N" when it
/// goes out of scope, on every path. Numbers start at 0 and are unique in the process.
class LogSection {
 public:
  explicit LogSection(std::string_view label);
  ~LogSection();
  LogSection(const LogSection&) = delete;
  LogSection& operator=(const LogSection&) = delete;

  [[nodiscard]] std::uint64_t number() const { return number_; }

 private:
  std::uint64_t number_;
};

}  // namespace mirabel
