#pragma once

#include <chrono>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "cli/ExitCode.h"
#include "mirabel/Session.h"

namespace mirabel {

/// Where a run of the program reads and writes.
struct Streams {
  std::ostream& out;
  std::ostream& err;
  bool isTerminal = false;  ///< whether `out` is one: colours and columns for people
  int descriptor = -1;      ///< of `out`, where it has one: shows that its reader has left
};

/// What was said before the command.
struct GlobalOptions {
  std::optional<std::string> home;
  bool json = false;
  bool embedded = false;
  bool verbose = false;
  std::chrono::milliseconds timeout{30'000};
};

/// What every command works with: opens the documents when they are first asked for, so that a
/// command that needs none does not wait for them.
class Program {
 public:
  Program(GlobalOptions options, Streams streams)
      : options_(std::move(options)), streams_(streams) {}

  [[nodiscard]] const GlobalOptions& options() const { return options_; }
  [[nodiscard]] std::ostream& out() const { return streams_.out; }
  /// False once nobody reads the answer any more, or it can't be written: time to end.
  [[nodiscard]] bool canWrite() const;
  [[nodiscard]] bool isTerminal() const { return streams_.isTerminal; }
  [[nodiscard]] int outputDescriptor() const { return streams_.descriptor; }

  /// Null after a failure that was reported; `exitCode` tells with what to end.
  [[nodiscard]] Documents* documents();
  [[nodiscard]] ExitCode exitCode() const { return exitCode_; }

  /// Tells something beside the answer, on standard error; with --json as {"notice":…}.
  void note(std::string_view text) const;
  /// Shows how far something has come on standard error, in place of what it showed before; an
  /// empty text takes that away. For a terminal.
  void showProgress(std::string_view text) const;
  /// Reports on standard error, for people or, with --json, for programs. `what` says what was
  /// tried, in lower case without a full stop. Answers the code to end with.
  ExitCode report(const Error& error, std::string_view what);
  /// The same for an argument that is not what it should be; answers `ExitCode::usage`.
  ExitCode reportUsage(std::string_view text);
  /// The same for what no single error tells; answers `ExitCode::failed`.
  ExitCode reportFailed(std::string_view text);

 private:
  GlobalOptions options_;
  Streams streams_;
  std::unique_ptr<Documents> documents_;
  ExitCode exitCode_ = ExitCode::done;
};

/// Writes the one line that a failure gets: for people, or as {"error":{…}}.
void reportFailure(std::ostream& err, bool asJSON, std::string_view domain, std::int64_t code,
                   std::string_view message);

}  // namespace mirabel
