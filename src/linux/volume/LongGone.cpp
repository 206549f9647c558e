#include "linux/volume/LongGone.h"

#include <algorithm>
#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

namespace mirabel {
namespace {

constexpr std::int64_t mostAtOnce = 10'000;

struct GoneRow {
  std::uint64_t slot = 0;
  std::uint64_t inode = 0;
  std::optional<std::uint64_t> fileID;  // nothing where the inode number is it
  std::uint64_t documentID = 0;
};

Result<std::vector<GoneRow>> rowsGoneBefore(Database& database, std::int64_t time) {
  auto statement = database.prepare(
      "SELECT slot, inode, file_id, document_id FROM objects "
      "WHERE folder IS NULL AND place < ?1 LIMIT ?2");
  if (!statement) return fail(statement.error());
  statement->bind(1, time).bind(2, mostAtOnce);
  std::vector<GoneRow> rows;
  while (true) {
    const auto found = statement->step();
    if (!found) return fail(found.error());
    if (!*found) return rows;
    GoneRow row;
    row.slot = statement->unsignedInteger(0);
    row.inode = statement->unsignedInteger(1);
    if (!statement->isNull(2)) row.fileID = statement->unsignedInteger(2);
    if (!statement->isNull(3)) row.documentID = statement->unsignedInteger(3);
    rows.push_back(row);
  }
}

enum class By { slot, fileID, documentID };
struct Step {
  const char* sql;
  By by;
};
constexpr Step steps[] = {
    // What lay in it has been nowhere for as long, and goes next.
    {"UPDATE objects SET folder = NULL, name = NULL, place = 0 WHERE folder = ?1", By::fileID},
    {"DELETE FROM links WHERE folder = ?1", By::fileID},
    {"DELETE FROM handovers WHERE folder = ?1", By::fileID},
    {"DELETE FROM handovers WHERE document_id = ?1", By::documentID},
    {"DELETE FROM links WHERE slot = ?1", By::slot},
    {"DELETE FROM objects WHERE slot = ?1", By::slot},
};

Result<std::vector<Statement>> prepareSteps(Database& database) {
  std::vector<Statement> statements;
  for (const Step& step : steps) {
    auto statement = database.prepare(step.sql);
    if (!statement) return fail(statement.error());
    statements.push_back(std::move(*statement));
  }
  return statements;
}

Result<void> forget(std::vector<Statement>& statements, const GoneRow& row) {
  for (std::size_t i = 0; i < statements.size(); ++i) {
    const By by = steps[i].by;
    const std::uint64_t number = by == By::slot     ? row.slot
                                 : by == By::fileID ? row.fileID.value_or(row.inode)
                                                    : row.documentID;
    if (auto done = statements[i].bind(1, number).run(); !done) return done;
  }
  return {};
}

Result<void> noteNewlyGone(Database& database, std::int64_t now) {
  auto statement =
      database.prepare("UPDATE objects SET place = ?1 WHERE folder IS NULL AND place IS NULL");
  if (!statement) return fail(statement.error());
  return statement->bind(1, now).run();
}

}  // namespace

Result<void> forgetLongGone(Database& database, IdentityStore& store,
                            IdentifierAllocator& allocator,
                            std::chrono::system_clock::time_point now, std::chrono::seconds age) {
  const std::int64_t seconds =
      std::chrono::duration_cast<std::chrono::seconds>(now.time_since_epoch()).count();
  if (auto noted = noteNewlyGone(database, seconds); !noted) return noted;
  auto statements = prepareSteps(database);
  if (!statements) return fail(statements.error());
  std::uint64_t spentBelow = 0;
  std::int64_t forgotten = 0;
  while (forgotten < mostAtOnce) {
    auto rows = rowsGoneBefore(database, seconds - age.count());
    if (!rows) return fail(rows.error());
    if (rows->empty()) break;
    for (const GoneRow& row : *rows) {
      if (!row.fileID) spentBelow = std::max(spentBelow, row.inode + 1);
      if (auto done = forget(*statements, row); !done) return done;
      ++forgotten;
    }
  }
  if (forgotten != 0) store.folderPaths().clear();
  return spentBelow == 0 ? Result<void>() : allocator.spendInodeNumbersBelow(spentBelow);
}

}  // namespace mirabel
