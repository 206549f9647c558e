#include <cerrno>
#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/ChangeBatch.h"
#include "cli/Commands.h"
#include "cli/ContainerArgument.h"

namespace mirabel {
namespace {

Result<void> tellChanges(Program& program, VesselEnumerator& enumerator, std::string anchor) {
  for (bool more = true; more;) {
    // The rest of a long history is not read for nobody.
    if (!program.canWrite()) return fail(Error::posix(EPIPE));
    const auto batch = ChangeBatch::ask(enumerator, anchor);
    if (!batch) return fail(batch.error());
    (*batch)->print(program);
    more = (*batch)->moreComing();
    anchor = (*batch)->anchor();
  }
  // People need the last one only, to ask again from there.
  if (!program.options().json) program.note("the anchor is now " + anchor);
  return {};
}

}  // namespace

ExitCode runAnchor(Program& program, const std::string& item) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  auto enumerator = ContainerArgument(item).enumerator(*session);
  if (!enumerator) return program.report(enumerator.error(), "can't find " + item);
  const auto anchor = currentAnchor(**enumerator);
  (*enumerator)->invalidate();
  if (!anchor) return program.report(anchor.error(), "can't take an anchor of " + item);
  if (program.options().json) {
    program.out() << nlohmann::json{{"anchor", *anchor}}.dump() << '\n';
  } else {
    program.out() << *anchor << '\n';
  }
  return ExitCode::done;
}

ExitCode runChanges(Program& program, const ChangesOptions& options) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const std::string failure = "can't tell the changes of " + options.item;
  auto enumerator = ContainerArgument(options.item).enumerator(*session);
  if (!enumerator) return program.report(enumerator.error(), failure);
  const auto told = tellChanges(program, **enumerator, options.since);
  (*enumerator)->invalidate();
  if (told) return ExitCode::done;
  return program.canWrite() ? program.report(told.error(), failure) : ExitCode::failed;
}

}  // namespace mirabel
