#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>

#include "cli/Commands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"
#include "items/LocalItem.h"

namespace mirabel {
namespace {

nlohmann::json appJSON(const LocalItem& library) {
  nlohmann::json object = itemJSON(library);
  if (const auto& bundle = library.vs_appContainerBundleIdentifier()) {
    setText(object, "bundleIdentifier", *bundle);
  }
  return object;
}

void printRows(const Program& program, const VesselItems& libraries) {
  std::size_t identifiers = 0;
  std::size_t names = 0;
  for (const auto& library : libraries) {
    identifiers = std::max(identifiers, displayWidth(printable(library->itemIdentifier())));
    names = std::max(names, displayWidth(printable(library->filename())));
  }
  for (const auto& library : libraries) {
    program.out() << padded(printable(library->itemIdentifier()), identifiers, Align::left) << "  "
                  << padded(printable(library->filename()), names, Align::left) << "  "
                  << printable(library->fileURL().path()) << '\n';
  }
}

std::string whyNoContainer(const Session& session, const std::string& bundle) {
  if (auto reason = session.reasonLeftOut(bundle)) return *std::move(reason);
  const bool isKnown = session.platform().applications.proxyForBundleIdentifier(bundle).has_value();
  return isKnown ? "the application has no folder for documents"
                 : "no application has this identifier";
}

Error noSuchContainer(const Session& session, const std::string& bundle) {
  Error error = Error::local(LocalVesselError::itemNotFound);
  error.userInfo[std::string(errorkey::detail)] = whyNoContainer(session, bundle);
  return error;
}

}  // namespace

ExitCode runApps(Program& program) {
  const Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const VesselItems libraries = session->libraries().shared().appLibraries();
  if (!program.options().json) {
    printRows(program, libraries);
    return ExitCode::done;
  }
  for (const auto& library : libraries)
    program.out() << appJSON(*library).dump() << '\n';
  return ExitCode::done;
}

ExitCode runContainer(Program& program, const std::string& bundle) {
  const Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  LocalVessel::ItemResult container = fail(Error::nonExistentItem(bundle));
  session->provider()._defaultApplicationContainerForBundleIdentifier(
      bundle, [&](LocalVessel::ItemResult answer) { container = std::move(answer); });
  if (!container) {
    const bool isUnknown = container.error().is(VesselErrorCode::invalidParameter);
    return program.report(isUnknown ? noSuchContainer(*session, bundle) : container.error(),
                          "can't find the folder of " + bundle);
  }
  if (!session->libraries().shared().bundleProxyWithRootURL((*container)->fileURL())) {
    program.note("the application does not show its documents: this folder is no app library");
  }
  printOutcome(program, **container);
  return ExitCode::done;
}

}  // namespace mirabel
