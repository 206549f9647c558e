#include "linux/volume/Database.h"

#include <cerrno>
#include <sqlite3.h>
#include <utility>

#include "linux/volume/PageSums.h"

namespace mirabel {
namespace {

// Exclusive locking keeps the log's index in memory and saves a lock per transaction; the volume
// has one owner anyway. The page cache is bounded: 8 MiB serve folders of 100,000 entries. The
// owner decides when the log is moved into the database.
constexpr const char* settings =
    "PRAGMA locking_mode=EXCLUSIVE;"
    "PRAGMA journal_mode=WAL;"
    "PRAGMA synchronous=FULL;"
    "PRAGMA cache_size=-8192;"
    "PRAGMA temp_store=MEMORY;"
    "PRAGMA trusted_schema=OFF;"
    "PRAGMA cell_size_check=ON;"
    "PRAGMA wal_autocheckpoint=0;";

/// Which file was being written to, as `sqlite3_file_control` calls it: transactions write to the
/// log, checkpoints to the database.
enum class WrittenFile { log = SQLITE_FCNTL_JOURNAL_POINTER, database = SQLITE_FCNTL_FILE_POINTER };

int lastErrnoOf(sqlite3* database, WrittenFile written) {
  sqlite3_file* file = nullptr;
  sqlite3_file_control(database, "main", static_cast<int>(written), static_cast<void*>(&file));
  if (file == nullptr || file->pMethods == nullptr) return 0;
  int number = 0;
  file->pMethods->xFileControl(file, SQLITE_FCNTL_LAST_ERRNO, &number);
  return number;
}

// SQLite knows a full disk only, and takes a full quota for an error of the disk. It is one where a
// sync finds it: what was written before may be lost then.
int missingRoom(sqlite3* database, int code, WrittenFile written) {
  if (code == SQLITE_FULL) return ENOSPC;
  const bool isQuota = code == SQLITE_IOERR_WRITE && lastErrnoOf(database, written) == EDQUOT;
  return isQuota ? EDQUOT : 0;
}

// A lack of room is an ordinary failure, and told as one. So is another process that has the
// database although the lock on its folder was free, because somebody removed the lock's file.
Error lastErrorOf(sqlite3* database, WrittenFile written = WrittenFile::log) {
  const int code = sqlite3_extended_errcode(database);
  if (const int missing = missingRoom(database, code, written); missing != 0) {
    const char* path = sqlite3_db_filename(database, nullptr);
    return Error::posix(missing, path == nullptr ? "" : path);
  }
  if ((code & 0xFF) == SQLITE_BUSY) {
    return Error::posix(EBUSY, "another process is using this volume's state");
  }
  return Error::store(code, sqlite3_errmsg(database));
}

}  // namespace

Result<std::unique_ptr<Database>> Database::open(const std::string& path) {
  sqlite3* handle = nullptr;
  const int code =
      sqlite3_open_v2(path.c_str(), &handle,
                      SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX |
                          SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_PRIVATECACHE,
                      summedFileLayer());
  std::unique_ptr<Database> database(new Database(handle));
  if (code != SQLITE_OK) return fail(database->lastError());
  sqlite3_extended_result_codes(handle, 1);
  // Both for a new database only; an older one keeps what it has.
  if (auto set = database->execute("PRAGMA page_size=4096"); !set) return fail(set.error());
  int reserved = pageSumSize;
  sqlite3_file_control(handle, "main", SQLITE_FCNTL_RESERVE_BYTES, &reserved);
  int persists = 1;
  sqlite3_file_control(handle, "main", SQLITE_FCNTL_PERSIST_WAL, &persists);
  if (auto set = database->execute(settings); !set) return fail(set.error());
  sqlite3_wal_hook(
      handle,
      [](void* count, sqlite3*, const char*, int pages) {
        *static_cast<int*>(count) = pages;
        return SQLITE_OK;
      },
      &database->logPages_);
  return database;
}

Database::~Database() {
  sqlite3_close_v2(handle_);
}

Result<void> Database::checkpoint(Log log) {
  const int mode = log == Log::emptied ? SQLITE_CHECKPOINT_TRUNCATE : SQLITE_CHECKPOINT_FULL;
  int pages = 0;
  int moved = 0;
  const int code = sqlite3_wal_checkpoint_v2(handle_, nullptr, mode, &pages, &moved);
  if (code != SQLITE_OK) return fail(lastErrorOf(handle_, WrittenFile::database));
  if (moved < pages) return fail(Error::store(SQLITE_BUSY, "the log is still being read"));
  logPages_ = 0;
  return {};
}

Result<void> Database::begin() {
  return runKept(begin_, "BEGIN");
}

Result<void> Database::commit() {
  return runKept(commit_, "COMMIT");
}

Result<void> Database::runKept(std::optional<Statement>& statement, const char* sql) {
  if (!statement) {
    auto prepared = prepare(sql);
    if (!prepared) return fail(prepared.error());
    statement = *std::move(prepared);
  }
  return statement->run();
}

Result<void> Database::execute(const char* sql) {
  if (sqlite3_exec(handle_, sql, nullptr, nullptr, nullptr) != SQLITE_OK) return fail(lastError());
  return {};
}

Result<Statement> Database::prepare(std::string_view sql) {
  sqlite3_stmt* statement = nullptr;
  const int code = sqlite3_prepare_v3(handle_, sql.data(), static_cast<int>(sql.size()),
                                      SQLITE_PREPARE_PERSISTENT, &statement, nullptr);
  if (code != SQLITE_OK) return fail(lastError());
  return Statement(statement);
}

Error Database::lastError() const {
  return lastErrorOf(handle_);
}

std::int64_t Database::changeCount() const {
  return sqlite3_total_changes64(handle_);
}

void Database::releaseMemory() {
  sqlite3_db_release_memory(handle_);
}

bool Database::metDamage() const {
  int met = 0;
  sqlite3_file_control(handle_, "main", metWrongPage, &met);
  return met != 0;
}

Statement::~Statement() {
  sqlite3_finalize(handle_);
}

Statement& Statement::bind(int index, std::int64_t value) {
  sqlite3_bind_int64(handle_, index, value);
  return *this;
}

Statement& Statement::bindBlob(int index, std::string_view bytes) {
  // A null pointer would bind NULL instead of no bytes.
  const char* data = bytes.data() == nullptr ? "" : bytes.data();
  sqlite3_bind_blob64(handle_, index, data, bytes.size(), SQLITE_STATIC);
  return *this;
}

Statement& Statement::bindNull(int index) {
  sqlite3_bind_null(handle_, index);
  return *this;
}

Result<bool> Statement::step() {
  const int code = sqlite3_step(handle_);
  if (code == SQLITE_ROW) return true;
  if (code == SQLITE_DONE) return false;
  return fail(lastErrorOf(sqlite3_db_handle(handle_)));
}

Result<void> Statement::run() {
  StatementScope scope(*this);
  while (true) {
    auto row = step();
    if (!row) return fail(row.error());
    if (!*row) return {};
  }
}

void Statement::reset() {
  sqlite3_reset(handle_);
}

bool Statement::isNull(int column) const {
  return sqlite3_column_type(handle_, column) == SQLITE_NULL;
}

std::int64_t Statement::integer(int column) const {
  return sqlite3_column_int64(handle_, column);
}

std::string_view Statement::blob(int column) const {
  const void* data = sqlite3_column_blob(handle_, column);
  if (data == nullptr) return {};
  return {static_cast<const char*>(data),
          static_cast<std::size_t>(sqlite3_column_bytes(handle_, column))};
}

}  // namespace mirabel
