#include <cerrno>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/ChangeBatch.h"
#include "cli/Commands.h"
#include "cli/ContainerArgument.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

Result<std::unique_ptr<DocumentContainer>> find(Documents& documents, const std::string& item) {
  const auto identifier = ContainerArgument(item).identifier(documents);
  if (!identifier) return fail(identifier.error());
  return documents.container(*identifier);
}

Result<void> tellChanges(Program& program, DocumentContainer& container, std::string anchor) {
  for (bool more = true; more;) {
    // The rest of a long history is not read for nobody.
    if (!program.canWrite()) return fail(Error::posix(EPIPE));
    const auto batch = ChangeBatch::ask(container, anchor);
    if (!batch) return fail(batch.error());
    batch->print(program);
    more = batch->moreComing();
    anchor = batch->anchor();
  }
  // People need the last one only, to ask again from there.
  if (!program.options().json) program.note("the anchor is now " + anchor);
  return {};
}

}  // namespace

ExitCode runAnchor(Program& program, const std::string& item) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto container = find(*documents, item);
  if (!container) return program.report(container.error(), "can't find " + named(item));
  const auto anchor = ChangeBatch::currentAnchor(**container);
  if (!anchor) return program.report(anchor.error(), "can't take an anchor of " + named(item));
  if (program.options().json) {
    program.out() << nlohmann::json{{"anchor", *anchor}}.dump() << '\n';
  } else {
    program.out() << *anchor << '\n';
  }
  return ExitCode::done;
}

ExitCode runChanges(Program& program, const ChangesOptions& options) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const std::string failure = "can't tell the changes of " + named(options.item);
  const auto container = find(*documents, options.item);
  if (!container) return program.report(container.error(), failure);
  const auto told = tellChanges(program, **container, options.since);
  if (told) return ExitCode::done;
  return program.canWrite() ? program.report(told.error(), failure) : ExitCode::failed;
}

}  // namespace mirabel
