#pragma once

#include <chrono>
#include <string>
#include <sys/types.h>
#include <vector>

#include "mirabel/UniqueFd.h"

namespace mirabel::testing {

/// What a running program writes, as it comes.
class Lines {
 public:
  explicit Lines(UniqueFd end) : end_(std::move(end)) {}

  /// Waits for a line, and answers it with its end; "" when there comes none any more, or none for
  /// far longer than it should take.
  std::string line();
  /// All the rest.
  std::string rest();
  /// Reads no further: who writes finds that its reader has left.
  void leave() { end_.reset(); }

 private:
  bool readMore();

  UniqueFd end_;
  std::string pending_;
};

/// A program that runs beside the test, which is killed with it. Signals have their default
/// effects on it.
class Running {
 public:
  /// The program, found along $PATH, and its arguments.
  explicit Running(std::vector<std::string> command);
  ~Running();
  Running(const Running&) = delete;
  Running& operator=(const Running&) = delete;

  [[nodiscard]] pid_t id() const { return process_; }
  [[nodiscard]] Lines& output() { return output_; }
  [[nodiscard]] Lines& errors() { return errors_; }
  /// Neither may be called once its end was waited for: they throw.
  void send(int signal) const;
  /// Waits for its end and answers the wait status.
  int end();

 private:
  pid_t process_ = -1;
  Lines output_{UniqueFd()};
  Lines errors_{UniqueFd()};
};

}  // namespace mirabel::testing
