#include "cli/OperationRun.h"

#include <chrono>
#include <future>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <utility>

#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;

constexpr auto beforeFirstLine = 1s;
constexpr auto betweenLines = 200ms;

}  // namespace

/// Shows how far the operations have come while a future is not ready.
class OperationRun::Waiting {
 public:
  Waiting(Program& program, Documents& documents)
      : program_(program), documents_(documents), before_(documents.progress()) {}

  template <class T>
  T wait(std::future<T> future) {
    const bool isShown = program_.isTerminal() && !program_.options().json;
    if (!isShown) return future.get();
    auto pause = std::chrono::milliseconds(beforeFirstLine);
    while (future.wait_for(pause) != std::future_status::ready) {
      show();
      pause = betweenLines;
    }
    if (hasShown_) program_.showProgress({});
    return future.get();
  }

 private:
  void show() {
    const Progress now = documents_.progress();
    const std::uint64_t copied = now.entriesCopied - before_.entriesCopied;
    const std::uint64_t bytes = now.bytesCopied - before_.bytesCopied;
    const std::uint64_t removed = now.entriesRemoved - before_.entriesRemoved;
    std::string line;
    if (copied > 0 || bytes > 0) {
      line = std::to_string(copied) + " copied, " + humanSize(bytes);
    } else if (removed > 0) {
      line = std::to_string(removed) + " removed";
    }
    if (line.empty()) return;
    program_.showProgress(line);
    hasShown_ = true;
  }

  Program& program_;
  Documents& documents_;
  Progress before_;  // the service may have done other work before
  bool hasShown_ = false;
};

OperationRun::Begun OperationRun::begin(const ItemStart& start) {
  const auto answer = std::make_shared<std::promise<Documents::ItemResult>>();
  start([answer](Documents::ItemResult result) { answer->set_value(std::move(result)); });
  return answer->get_future();
}

Documents::ItemResult OperationRun::wait(Begun begun) const {
  return Waiting(program_, documents_).wait(std::move(begun));
}

Documents::ItemResult OperationRun::item(const ItemStart& start) const {
  return wait(begin(start));
}

std::optional<Error> OperationRun::error(
    const std::function<void(Documents::ErrorHandler)>& start) const {
  const auto answer = std::make_shared<std::promise<std::optional<Error>>>();
  start([answer](std::optional<Error> error) { answer->set_value(std::move(error)); });
  return Waiting(program_, documents_).wait(answer->get_future());
}

ExitCode runOnItem(Program& program, const std::string& item, std::string_view what,
                   const ItemOperation& operation) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto found = ItemArgument(item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + named(item));
  const auto result = OperationRun(program, *documents).item([&](auto done) {
    operation(*found, std::move(done));
  });
  if (!result) return program.report(result.error(), what);
  printOutcome(program, *result);
  return ExitCode::done;
}

void printOutcome(Program& program, const ItemRecord& item) {
  if (program.options().json) {
    program.out() << itemJSON(item).dump() << '\n';
    return;
  }
  program.out() << printable(item.itemIdentifier) << "  " << printable(item.path) << '\n';
}

}  // namespace mirabel
