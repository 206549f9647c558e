#pragma once

#include <chrono>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "cli/ExitCode.h"
#include "cli/Session.h"

namespace mirabel {

/// Where a run of the program reads and writes.
struct Streams {
  std::ostream& out;
  std::ostream& err;
  bool isTerminal = false;  ///< whether `out` is one: colours and columns for people
};

/// What was said before the command.
struct GlobalOptions {
  std::optional<std::string> home;
  bool json = false;
  bool embedded = false;
  bool verbose = false;
  std::chrono::milliseconds timeout{30'000};
};

/// What every command works with: opens the session when it is first asked for, so that a command
/// that needs none does not wait for one.
class Program {
 public:
  Program(GlobalOptions options, Streams streams)
      : options_(std::move(options)), streams_(streams) {}

  [[nodiscard]] const GlobalOptions& options() const { return options_; }
  [[nodiscard]] std::ostream& out() const { return streams_.out; }
  [[nodiscard]] bool isTerminal() const { return streams_.isTerminal; }

  /// Null after a failure that was reported; `exitCode` tells with what to end.
  [[nodiscard]] Session* session();
  [[nodiscard]] ExitCode exitCode() const { return exitCode_; }

  /// Tells people something beside the answer, on standard error.
  void note(std::string_view text) const;
  /// Reports on standard error, for people or, with --json, for programs. `what` says what was
  /// tried, in lower case without a full stop. Answers the code to end with.
  ExitCode report(const Error& error, std::string_view what = {});

 private:
  GlobalOptions options_;
  Streams streams_;
  std::unique_ptr<Session> session_;
  ExitCode exitCode_ = ExitCode::done;
};

}  // namespace mirabel
