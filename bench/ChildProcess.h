#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

namespace mirabel::bench {

/// A program that is started, spoken to line by line over its standard input and output, and ended
/// by its id.
class ChildProcess {
 public:
  /// `arguments` begin with the program, looked for along PATH.
  explicit ChildProcess(const std::vector<std::string>& arguments);
  /// This program in another role; see `runRole`.
  [[nodiscard]] static std::vector<std::string> role(std::vector<std::string> arguments);
  /// Ends it, unless it has ended, and waits for that.
  ~ChildProcess();
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;

  [[nodiscard]] pid_t id() const { return id_; }
  [[nodiscard]] bool hasStarted() const { return id_ > 0; }
  void tell(const std::string& line) const;
  /// The next line, without its end; empty when the program has ended.
  [[nodiscard]] std::string hear() const;

 private:
  pid_t id_ = -1;
  int input_ = -1;
  int output_ = -1;
};

}  // namespace mirabel::bench
