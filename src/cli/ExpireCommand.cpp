#include <cstdint>
#include <functional>
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
constexpr std::uint64_t mostNamed = 20;

/// What a look at the trash finds.
struct Findings {
  std::uint64_t old = 0;      ///< trashed before the date
  std::uint64_t undated = 0;  ///< that would be given a date
};

using TrashedEntry = LocalVessel::TrashedEntry;

Findings lookAtTrash(
    const LocalVessel& provider, const Date& reference,
    const std::function<void(const TrashedEntry&)>& tell = [](const auto&) {}) {
  Findings found;
  provider.forEachTrashedEntry([&](const TrashedEntry& entry) {
    if (!entry.trashDate || !*entry.trashDate) {
      ++found.undated;
    } else if (**entry.trashDate < reference) {
      ++found.old;
      tell(entry);
    }
  });
  return found;
}

std::string items(std::uint64_t count) {
  return std::to_string(count) + (count == 1 ? " item" : " items");
}

void tellEntry(const Program& program, const LocalVessel& provider, const TrashedEntry& entry) {
  const std::string& path = entry.url.path();
  const auto identifier = provider.persistentIdentifierForItemAtURL(entry.url);
  const Date& date = **entry.trashDate;
  if (program.options().json) {
    nlohmann::json line;
    if (identifier) setText(line, "wouldDelete", *identifier);
    setText(line, "path", path);
    line["trashDate"] = date.rfc3339();
    program.out() << line.dump() << '\n';
    return;
  }
  program.out() << "would remove " << printable(identifier.value_or("?")) << "  " << printable(path)
                << "  (trashed " << humanDate(date) << ")\n";
}

ExitCode tellWhatWouldGo(const Program& program, const LocalVessel& provider,
                         const Date& reference) {
  const Findings found = lookAtTrash(
      provider, reference, [&](const TrashedEntry& entry) { tellEntry(program, provider, entry); });
  if (program.options().json) {
    const nlohmann::json line = {{"wouldRemove", found.old}, {"wouldDate", found.undated}};
    program.out() << line.dump() << '\n';
    return ExitCode::done;
  }
  program.out() << "would remove " << items(found.old) << " trashed before " << humanDate(reference)
                << '\n';
  if (found.undated > 0) {
    program.out() << items(found.undated) << " without a date would be counted from now on\n";
  }
  return ExitCode::done;
}

void removeOlderThan(Program& program, Session& session, const Date& reference) {
  // On a thread of its own, for the request is busy with the trash while the deletions begin, and
  // this one shows how far they have come.
  std::jthread request;
  const auto error = OperationRun(program, session).error([&](auto done) {
    request = std::jthread([&session, reference, done = std::move(done)]() mutable {
      session.provider()._removeTrashedItemsOlderThanDate(reference, std::move(done));
    });
  });
  static_cast<void>(error);  // there never is one; what was not removed is still there
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
    return program.reportUsage("can't use " + options.olderThan +
                               "; --older-than takes a date like 2026-11-21 or "
                               "2026-11-21T09:30:00Z, or an age like 30d, 12h, 2w, 45m or 90s");
  }
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const LocalVessel& provider = session->provider();
  if (options.isDryRun) return tellWhatWouldGo(program, provider, *reference);
  // The provider does not tell what it could not remove, but the trash does.
  const Findings before = lookAtTrash(provider, *reference);
  removeOlderThan(program, *session, *reference);
  std::uint64_t named = 0;
  const Findings after = lookAtTrash(provider, *reference, [&](const TrashedEntry& entry) {
    if (named++ < mostNamed) program.note("still in the trash: " + entry.url.path());
  });
  tellOutcome(program, *reference, difference(before.old, after.old), after.old,
              difference(before.undated, after.undated));
  if (after.old == 0) return ExitCode::done;
  return program.reportFailed("can't remove " + items(after.old) +
                              "; the log says why, and --verbose shows it");
}

}  // namespace mirabel
