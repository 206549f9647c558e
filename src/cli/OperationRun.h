#pragma once

#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "cli/Program.h"

namespace mirabel {

/// Has the provider do something to an item and waits for it, with a line of progress on standard
/// error for people at a terminal once it takes longer than a second. Owned by a command.
class OperationRun {
 public:
  /// Both outlive it.
  OperationRun(Program& program, Documents& documents) : program_(program), documents_(documents) {}

  using ItemStart = std::function<void(Documents::ItemHandler)>;
  [[nodiscard]] Documents::ItemResult item(const ItemStart& start) const;
  /// The same in two steps, for several that run at once.
  using Begun = std::future<Documents::ItemResult>;
  [[nodiscard]] static Begun begin(const ItemStart& start);
  [[nodiscard]] Documents::ItemResult wait(Begun begun) const;
  [[nodiscard]] std::optional<Error> error(
      const std::function<void(Documents::ErrorHandler)>& start) const;

 private:
  class Waiting;

  Program& program_;
  Documents& documents_;
};

/// Finds the item that is named, does something to it and prints what comes of it. `what` says for
/// a failure what was tried.
using ItemOperation =
    std::function<void(const ItemRecord& item, Documents::ItemHandler completionHandler)>;
[[nodiscard]] ExitCode runOnItem(Program& program, const std::string& item, std::string_view what,
                                 const ItemOperation& operation);

/// Prints the item that an operation handed back: its identifier and where it lies, or all of its
/// properties with --json.
void printOutcome(Program& program, const ItemRecord& item);

/// Ends with the first failure's code, but does what can be done.
class Outcomes {
 public:
  void add(ExitCode code) {
    if (first_ == ExitCode::done) first_ = code;
  }
  [[nodiscard]] ExitCode exitCode() const { return first_; }

 private:
  ExitCode first_ = ExitCode::done;
};

}  // namespace mirabel
