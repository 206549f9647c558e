#include "linux/volume/EventJournal.h"

#include <algorithm>
#include <utility>

namespace mirabel {
namespace {

// How long one row of times stands for, and how many rows of events go in one call at least.
constexpr std::int64_t hour = 3600;
constexpr std::uint64_t smallPiece = 10'000;

// `history` has one row: the bounds outlive the records, so that an ID is never used twice.
// A row of `event_times` says when the event of that ID was written; the events from there to the
// next row's were written within the hour after. A column of `events` would cost more than all
// this is worth.
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
CREATE TABLE IF NOT EXISTS event_times(
  first_id INTEGER PRIMARY KEY,
  time INTEGER NOT NULL);
)";

enum Query : std::size_t {
  bounds,
  setBounds,
  append_,
  replay_,
  oldest,
  removeBefore,
  lastTime,
  addTime,
  lowerTimes,
  firstAfter,
  removeTimes,
  removeAll,
  removeAllTimes,
};

}  // namespace

Result<std::unique_ptr<EventJournal>> EventJournal::open(Database& database, Now now) {
  if (auto made = database.execute(schema); !made) return fail(made.error());
  std::unique_ptr<EventJournal> journal(new EventJournal(std::move(now)));
  for (const char* sql : {
           "SELECT first_id, next_id FROM history",
           "INSERT OR REPLACE INTO history(only, first_id, next_id) VALUES(1, ?1, ?2)",
           "INSERT INTO events(id, document_id, folder, path, file_id, changed_kind, source, "
           "destination) VALUES(?1,?2,?3,?4,?5,?6,?7,?8)",
           "SELECT id, document_id, folder, path, file_id, changed_kind, source, destination "
           "FROM events WHERE id > ?1 ORDER BY id LIMIT ?2",
           "SELECT min(id) FROM events",
           "DELETE FROM events WHERE id < ?1",
           "SELECT time FROM event_times ORDER BY first_id DESC LIMIT 1",
           "INSERT OR REPLACE INTO event_times(first_id, time) VALUES(?1, ?2)",
           "UPDATE event_times SET time = ?1 WHERE time > ?1",
           "SELECT first_id FROM event_times WHERE time > ?1 ORDER BY first_id LIMIT 1",
           "DELETE FROM event_times WHERE first_id < "
           "(SELECT max(first_id) FROM event_times WHERE first_id <= ?1)",
           "DELETE FROM events",
           "DELETE FROM event_times",
       }) {
    auto statement = database.prepare(sql);
    if (!statement) return fail(statement.error());
    journal->statements_.push_back(std::move(*statement));
  }
  if (auto loaded = journal->reload(); !loaded) return fail(loaded.error());
  return journal;
}

Result<void> EventJournal::reload() {
  {
    Statement& statement = statements_[bounds];
    StatementScope scope(statement);
    auto found = statement.step();
    if (!found) return fail(found.error());
    isActive_ = *found;
    if (!*found) return {};
    firstID_ = statement.unsignedInteger(0);
    nextID_ = savedNextID_ = statement.unsignedInteger(1);
  }
  StatementScope scope(statements_[lastTime]);
  auto found = statements_[lastTime].step();
  if (!found) return fail(found.error());
  lastTime_.reset();
  if (*found) lastTime_ = statements_[lastTime].integer(0);
  return {};
}

std::int64_t EventJournal::seconds() const {
  return std::chrono::floor<std::chrono::seconds>(now_()).time_since_epoch().count();
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
  ++appended_;
  return {};
}

Result<void> EventJournal::saveBounds() {
  if (nextID_ == savedNextID_) return {};
  if (auto noted = noteTime(); !noted) return noted;
  savedNextID_ = nextID_;
  return statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
}

Result<void> EventJournal::noteTime() {
  const std::int64_t now = seconds();
  if (lastTime_ && now >= *lastTime_ && now < *lastTime_ + hour) return {};
  if (lastTime_ && now < *lastTime_) {
    // The clock was set back: times of the future would keep events for ever.
    if (auto lowered = statements_[lowerTimes].bind(1, now).run(); !lowered) return lowered;
  }
  if (auto added = statements_[addTime].bind(1, savedNextID_).bind(2, now).run(); !added) {
    return added;
  }
  lastTime_ = now;
  return {};
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

Result<void> EventJournal::prune(const Retention& retention) {
  auto first = firstYoungerThan(seconds() - retention.age.count());
  if (!first) return fail(first.error());
  if (nextID_ - *first > retention.count) *first = nextID_ - retention.count;
  if (*first > firstID_) {
    if (auto gone = statements_[removeTimes].bind(1, *first).run(); !gone) return gone;
    firstID_ = *first;
    auto set = statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
    if (!set) return set;
  }
  return removeRows();
}

// The first record that may have been written after `time`; behind the last when there is none.
Result<std::uint64_t> EventJournal::firstYoungerThan(std::int64_t time) {
  Statement& statement = statements_[firstAfter].bind(1, time - hour);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  return std::max(firstID_, *found ? statement.unsignedInteger(0) : nextID_);
}

Result<void> EventJournal::removeRows() {
  std::uint64_t from = 0;
  {
    StatementScope scope(statements_[oldest]);
    auto found = statements_[oldest].step();
    if (!found) return fail(found.error());
    if (!*found || statements_[oldest].isNull(0)) return {};
    from = statements_[oldest].unsignedInteger(0);
  }
  if (from >= firstID_) return {};
  // Twice as many as came, so that what is left over becomes less.
  const std::uint64_t piece = std::max(smallPiece, 2 * std::exchange(appended_, 0));
  return statements_[removeBefore].bind(1, std::min(firstID_, from + piece)).run();
}

Result<void> EventJournal::startOver() {
  if (!isActive_) return {};
  if (auto gone = statements_[removeAll].run(); !gone) return gone;
  if (auto gone = statements_[removeAllTimes].run(); !gone) return gone;
  lastTime_.reset();
  firstID_ = nextID_;
  return statements_[setBounds].bind(1, firstID_).bind(2, nextID_).run();
}

}  // namespace mirabel
