#include <utility>

#include "cli/ItemArgument.h"
#include "cli/ItemCommands.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"
#include "host/ErrorText.h"

namespace mirabel {
namespace {

/// What a refusal means for this item, in words that say what to do.
Error explained(Error error, bool isTrashed) {
  if (!error.is(VesselErrorCode::invalidParameter)) return error;
  error.userInfo.erase(std::string(toldExplanation));
  error.userInfo[std::string(errorkey::detail)] =
      isTrashed ? "the folder that it came from is gone or in the trash itself, or not known; say "
                  "with --to where it shall go"
                : "it is not in the trash";
  return error;
}

ExitCode restoreOne(Program& program, const std::string& item,
                    const std::optional<std::string>& parent) {
  Documents& documents = *program.documents();
  const auto found = ItemArgument(item).item(documents);
  if (!found) return program.report(found.error(), "can't find " + named(item));
  const auto result = OperationRun(program, documents).item([&](auto done) {
    documents.restore(*found, parent, std::move(done));
  });
  if (!result) {
    return program.report(explained(result.error(), found->isTrashed),
                          "can't restore " + named(item));
  }
  printOutcome(program, *result);
  return ExitCode::done;
}

}  // namespace

ExitCode runTrash(Program& program, const std::vector<std::string>& items) {
  Outcomes outcomes;
  for (const std::string& item : items) {
    outcomes.add(runOnItem(program, item, "can't trash " + named(item),
                           [&](const ItemRecord& found, auto done) {
                             program.documents()->trash(found, std::move(done));
                           }));
  }
  return outcomes.exitCode();
}

ExitCode runRestore(Program& program, const RestoreOptions& options) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  std::optional<std::string> parent;
  if (options.parent) {
    const auto found = ItemArgument(*options.parent).item(*documents);
    if (!found) return program.report(found.error(), "can't find " + named(*options.parent));
    if (found->isTrashed) {
      Error unfit = Error::invalidParameter("parent", found->itemIdentifier);
      unfit.userInfo[std::string(errorkey::detail)] = "it is in the trash itself";
      return program.report(unfit, "can't restore to " + named(*options.parent));
    }
    parent = found->itemIdentifier;
  }
  Outcomes outcomes;
  for (const std::string& item : options.items)
    outcomes.add(restoreOne(program, item, parent));
  return outcomes.exitCode();
}

}  // namespace mirabel
