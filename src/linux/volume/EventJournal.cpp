#include "linux/volume/EventJournal.h"

#include <utility>

namespace mirabel {
namespace {

// `history` has one row: the bounds outlive the records, so that an ID is never used twice.
constexpr const char* schema = R"(
CREATE TABLE IF NOT EXISTS events(
  id INTEGER PRIMARY KEY,
  document_id INTEGER,
  folder INTEGER,
  path BLOB,
  file_id INTEGER,
  changed_kind INTEGER,
  source INTEGER,
  destination INTEGER);
CREATE TABLE IF NOT EXISTS history(
  only INTEGER PRIMARY KEY CHECK(only = 1),
  first_id INTEGER NOT NULL,
  next_id INTEGER NOT NULL);
)";

enum Query : std::size_t { bounds, setBounds, append_, replay_, prune_ };

}  // namespace

Result<std::unique_ptr<EventJournal>> EventJournal::open(Database& database) {
  if (auto made = database.execute(schema); !made) return fail(made.error());
  std::unique_ptr<EventJournal> journal(new EventJournal);
  for (const char* sql : {
           "SELECT first_id, next_id FROM history",
           "INSERT OR REPLACE INTO history(only, first_id, next_id) VALUES(1, ?1, ?2)",
           "INSERT INTO events(id, document_id, folder, path, file_id, changed_kind, source, "
           "destination) VALUES(?1,?2,?3,?4,?5,?6,?7,?8)",
           "SELECT id, document_id, folder, path, file_id, changed_kind, source, destination "
           "FROM events WHERE id > ?1 ORDER BY id LIMIT ?2",
           "DELETE FROM events WHERE id < ?1",
       }) {
    auto statement = database.prepare(sql);
    if (!statement) return fail(statement.error());
    journal->statements_.push_back(std::move(*statement));
  }
  if (auto loaded = journal->reload(); !loaded) return fail(loaded.error());
  return journal;
}

Result<void> EventJournal::reload() {
  Statement& statement = statements_[bounds];
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  isActive_ = *found;
  if (!*found) return {};
  firstID_ = statement.unsignedInteger(0);
  nextID_ = savedNextID_ = statement.unsignedInteger(1);
  return {};
}

Result<void> EventJournal::activate() {
  if (isActive_) return {};
  isActive_ = true;
  return statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
}

Result<void> EventJournal::append(const JournalRecord& record) {
  if (!isActive_) return {};
  Statement& statement = statements_[append_];
  statement.bind(1, nextID_);
  const auto bindUnlessZero = [&](int index, std::uint64_t value) {
    value == 0 ? statement.bindNull(index) : statement.bind(index, value);
  };
  bindUnlessZero(2, record.documentID);
  if (record.isDocument) {
    statement.bindNull(3).bindNull(4).bindNull(5).bindNull(6);
    statement.bind(7, record.source).bind(8, record.destination);
  } else {
    statement.bind(3, record.folder).bindBlob(4, record.path).bind(5, record.fileID);
    statement.bind(6, std::int64_t{record.changedKind}).bindNull(7).bindNull(8);
  }
  if (auto written = statement.run(); !written) return written;
  ++nextID_;
  return {};
}

Result<void> EventJournal::saveBounds() {
  if (nextID_ == savedNextID_) return {};
  savedNextID_ = nextID_;
  return statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
}

Result<std::vector<JournalRecord>> EventJournal::replay(std::uint64_t since, std::size_t limit) {
  Statement& statement = statements_[replay_].bind(1, since).bind(2, std::uint64_t{limit});
  StatementScope scope(statement);
  std::vector<JournalRecord> records;
  while (true) {
    auto found = statement.step();
    if (!found) return fail(found.error());
    if (!*found) return records;
    JournalRecord record;
    record.id = statement.unsignedInteger(0);
    record.documentID = static_cast<std::uint32_t>(statement.integer(1));
    record.isDocument = statement.isNull(3);
    record.folder = statement.unsignedInteger(2);
    record.path = statement.blob(3);
    record.fileID = statement.unsignedInteger(4);
    record.changedKind = statement.integer(5) != 0;
    record.source = statement.unsignedInteger(6);
    record.destination = statement.unsignedInteger(7);
    records.push_back(std::move(record));
  }
}

Result<void> EventJournal::prune(std::uint64_t kept) {
  if (nextID_ - firstID_ <= kept) return {};
  const std::uint64_t first = nextID_ - kept;
  if (auto gone = statements_[prune_].bind(1, first).run(); !gone) return gone;
  firstID_ = first;
  return statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
}

}  // namespace mirabel
