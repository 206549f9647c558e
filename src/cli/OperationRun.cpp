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
#include "linux/operations/OperationProgress.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;

constexpr auto beforeFirstLine = 1s;
constexpr auto betweenLines = 200ms;

}  // namespace

/// Shows how far the operations have come while a future is not ready.
class OperationRun::Waiting {
 public:
  Waiting(Program& program, const OperationProgress& progress)
      : program_(program), progress_(progress) {}

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
    const std::uint64_t copied = progress_.entriesCopied;
    const std::uint64_t bytes = progress_.bytesCopied;
    const std::uint64_t removed = progress_.entriesRemoved;
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
  const OperationProgress& progress_;
  bool hasShown_ = false;
};

OperationRun::Begun OperationRun::begin(const ItemStart& start) {
  const auto answer = std::make_shared<std::promise<LocalVessel::ItemResult>>();
  start([answer](LocalVessel::ItemResult result) { answer->set_value(std::move(result)); });
  return answer->get_future();
}

LocalVessel::ItemResult OperationRun::wait(Begun begun) const {
  return Waiting(program_, session_.linuxPlatform().progress()).wait(std::move(begun));
}

LocalVessel::ItemResult OperationRun::item(const ItemStart& start) const {
  return wait(begin(start));
}

std::optional<Error> OperationRun::error(
    const std::function<void(LocalVessel::ErrorHandler)>& start) const {
  const auto answer = std::make_shared<std::promise<std::optional<Error>>>();
  start([answer](std::optional<Error> error) { answer->set_value(std::move(error)); });
  return Waiting(program_, session_.linuxPlatform().progress()).wait(answer->get_future());
}

ExitCode runOnItem(Program& program, const std::string& item, std::string_view what,
                   const ItemOperation& operation) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const auto found = ItemArgument(item).item(*session);
  if (!found) return program.report(found.error(), "can't find " + item);
  const std::string identifier = (*found)->itemIdentifier();
  const auto result = OperationRun(program, *session).item([&](auto done) {
    operation(identifier, std::move(done));
  });
  if (!result) return program.report(result.error(), what);
  printOutcome(program, **result);
  return ExitCode::done;
}

void printOutcome(Program& program, const LocalItem& item) {
  if (program.options().json) {
    program.out() << itemJSON(item).dump() << '\n';
    return;
  }
  program.out() << printable(item.itemIdentifier()) << "  " << printable(item.fileURL().path())
                << '\n';
}

}  // namespace mirabel
