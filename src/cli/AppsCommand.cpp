#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <vector>

#include "cli/Commands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

nlohmann::json appJSON(const ItemRecord& library) {
  nlohmann::json object = itemJSON(library);
  if (const auto& bundle = library.appContainerBundleIdentifier) {
    setText(object, "bundleIdentifier", *bundle);
  }
  return object;
}

void printRows(const Program& program, const std::vector<ItemRecord>& libraries) {
  std::size_t identifiers = 0;
  std::size_t names = 0;
  for (const auto& library : libraries) {
    identifiers = std::max(identifiers, displayWidth(printable(library.itemIdentifier)));
    names = std::max(names, displayWidth(printable(library.filename)));
  }
  for (const auto& library : libraries) {
    program.out() << padded(printable(library.itemIdentifier), identifiers, Align::left) << "  "
                  << padded(printable(library.filename), names, Align::left) << "  "
                  << printable(library.path) << '\n';
  }
}

}  // namespace

ExitCode runApps(Program& program) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto libraries = documents->appLibraries();
  if (!libraries) return program.report(libraries.error(), "can't list the app libraries");
  if (const auto status = documents->status(); status && status->appLibrariesFailure) {
    program.note("the list of app libraries can't be brought up to date; " +
                 *status->appLibrariesFailure);
  }
  if (!program.options().json) {
    printRows(program, *libraries);
    return ExitCode::done;
  }
  for (const ItemRecord& library : *libraries)
    program.out() << appJSON(library).dump() << '\n';
  return ExitCode::done;
}

ExitCode runContainer(Program& program, const std::string& bundle) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto container = documents->applicationContainer(bundle);
  if (!container) {
    return program.report(container.error(), "can't find the folder of " + named(bundle));
  }
  if (!container->isAppLibrary) {
    program.note("the application does not show its documents: this folder is no app library");
  }
  printOutcome(program, container->item);
  return ExitCode::done;
}

}  // namespace mirabel
