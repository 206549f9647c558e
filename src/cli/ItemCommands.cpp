#include "cli/ItemCommands.h"

#include <utility>

#include "cli/ItemArgument.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"

namespace mirabel {

ExitCode runMakeFolder(Program& program, const CreateOptions& options) {
  return runOnItem(program, options.parent, "can't make the folder " + named(options.name),
                   [&](const ItemRecord& parent, auto done) {
                     program.documents()->createDirectory(options.name, parent.itemIdentifier,
                                                          std::move(done));
                   });
}

ExitCode runImport(Program& program, const ImportOptions& options) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto parent = ItemArgument(options.parent).item(*documents);
  if (!parent) return program.report(parent.error(), "can't find " + named(options.parent));
  const OperationRun run(program, *documents);
  // All at once, for they wait for the disk most of the time, and told in their order.
  std::vector<std::pair<std::string, OperationRun::Begun>> begun;
  for (const std::string& file : options.files) {
    const auto source = ItemArgument::resolvedPath(file);
    begun.emplace_back(file, OperationRun::begin([&](auto done) {
                         if (!source) return done(fail(source.error()));
                         documents->importDocument(*source, parent->itemIdentifier,
                                                   std::move(done));
                       }));
  }
  Outcomes outcomes;
  for (auto& [file, operation] : begun) {
    const auto result = run.wait(std::move(operation));
    if (!result) {
      outcomes.add(program.report(result.error(), "can't import " + named(file)));
    } else {
      printOutcome(program, *result);
    }
  }
  return outcomes.exitCode();
}

ExitCode runRename(Program& program, const RenameOptions& options) {
  return runOnItem(program, options.item,
                   "can't rename " + named(options.item) + " to " + named(options.name),
                   [&](const ItemRecord& item, auto done) {
                     program.documents()->rename(item, options.name, std::move(done));
                   });
}

ExitCode runMove(Program& program, const MoveOptions& options) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto parent = ItemArgument(options.parent).item(*documents);
  if (!parent) return program.report(parent.error(), "can't find " + named(options.parent));
  return runOnItem(
      program, options.item, "can't move " + named(options.item) + " to " + named(options.parent),
      [&](const ItemRecord& item, auto done) {
        documents->reparent(item, parent->itemIdentifier, options.name, std::move(done));
      });
}

}  // namespace mirabel
