#include <cstdint>
#include <nlohmann/json.hpp>
#include <ostream>
#include <thread>
#include <utility>

#include "cli/ItemCommands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"
#include "cli/ReferenceDate.h"

namespace mirabel {
namespace {

// More would bury what is said of all of them.
constexpr std::size_t mostNamed = 20;

std::string items(std::uint64_t count) {
  return std::to_string(count) + (count == 1 ? " item" : " items");
}

void tellEntry(const Program& program, const TrashedItem& entry) {
  if (program.options().json) {
    nlohmann::json line;
    if (entry.itemIdentifier) setText(line, "wouldDelete", *entry.itemIdentifier);
    setText(line, "path", entry.path);
    line["trashDate"] = entry.trashDate.rfc3339();
    program.out() << line.dump() << '\n';
    return;
  }
  program.out() << "would remove " << printable(entry.itemIdentifier.value_or("?")) << "  "
                << printable(entry.path) << "  (trashed " << humanDate(entry.trashDate) << ")\n";
}

void tellWhatWouldGo(const Program& program, const TrashFindings& found, const Date& reference) {
  for (const TrashedItem& entry : found.old)
    tellEntry(program, entry);
  if (program.options().json) {
    const nlohmann::json line = {{"wouldRemove", found.old.size()}, {"wouldDate", found.undated}};
    program.out() << line.dump() << '\n';
    return;
  }
  program.out() << "would remove " << items(found.old.size()) << " trashed before "
                << humanDate(reference) << '\n';
  if (found.undated > 0) {
    program.out() << items(found.undated) << " without a date would be counted from now on\n";
  }
}

std::optional<Error> removeOlderThan(Program& program, Documents& documents,
                                     const Date& reference) {
  // On a thread of its own, for the request is busy with the trash while the deletions begin, and
  // this one shows how far they have come.
  std::jthread request;
  return OperationRun(program, documents).error([&](auto done) {
    request = std::jthread([&documents, reference, done = std::move(done)]() mutable {
      documents.removeItemsTrashedBefore(reference, std::move(done));
    });
  });
}

void tellOutcome(const Program& program, const Date& reference, std::uint64_t removed,
                 std::uint64_t kept, std::uint64_t dated) {
  if (program.options().json) {
    const nlohmann::json line = {{"removed", removed}, {"notRemoved", kept}, {"dated", dated}};
    program.out() << line.dump() << '\n';
    return;
  }
  program.out() << "removed " << items(removed) << " trashed before " << humanDate(reference)
                << '\n';
  if (dated > 0) {
    program.out() << items(dated) << " had no date: counted from now on\n";
  }
}

std::uint64_t difference(std::uint64_t before, std::uint64_t after) {
  return before > after ? before - after : 0;
}

}  // namespace

ExitCode runExpire(Program& program, const ExpireOptions& options) {
  const auto reference = referenceDateFrom(options.olderThan, Date::now());
  if (!reference) {
    return program.reportUsage("can't use " + named(options.olderThan) +
                               "; --older-than takes a date like 2026-11-21 or "
                               "2026-11-21T09:30:00Z, or an age like 30d, 12h, 2w, 45m or 90s");
  }
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const std::string failure = "can't look into the trash";
  // The provider does not tell what it could not remove, but the trash does.
  const auto before = documents->itemsTrashedBefore(*reference);
  if (!before) return program.report(before.error(), failure);
  if (options.isDryRun) {
    tellWhatWouldGo(program, *before, *reference);
    return ExitCode::done;
  }
  if (const auto error = removeOlderThan(program, *documents, *reference)) {
    return program.report(*error, "can't empty the trash");
  }
  const auto after = documents->itemsTrashedBefore(*reference);
  if (!after) return program.report(after.error(), failure);
  for (std::size_t i = 0; i < after->old.size() && i < mostNamed; ++i)
    program.note("still in the trash: " + after->old[i].path);
  tellOutcome(program, *reference, difference(before->old.size(), after->old.size()),
              after->old.size(), difference(before->undated, after->undated));
  if (after->old.empty()) return ExitCode::done;
  return program.reportFailed("can't remove " + items(after->old.size()) +
                              "; the log says why, and --verbose shows it");
}

}  // namespace mirabel
