#include "host/search/SearchSchema.h"

#include <sqlite3.h>
#include <string>
#include <string_view>

#include "host/search/SearchText.h"

namespace mirabel {
namespace {

// "MRBX", and the number of the format, which changes with the tables and with what they hold.
constexpr std::int64_t applicationID = 0x4D524258;
constexpr std::int64_t formatVersion = 1;

// Trigrams find parts of words; without positions they are quick to write, and what they find is
// compared with the text anyway. The table keeps no texts of its own: those are in `items`.
constexpr const char* tables =
    "CREATE TABLE facts(name TEXT PRIMARY KEY, value BLOB NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE items(place INTEGER PRIMARY KEY, identifier BLOB NOT NULL, name BLOB NOT NULL,"
    " tags BLOB NOT NULL, type BLOB NOT NULL, modified INTEGER, recency INTEGER, favorite INTEGER,"
    " domain BLOB NOT NULL, flags INTEGER NOT NULL);"
    "CREATE VIRTUAL TABLE words USING fts5(text, content='', columnsize=0, detail=none,"
    " tokenize='trigram case_sensitive 1');";

constexpr const char* indexes =
    "CREATE UNIQUE INDEX IF NOT EXISTS identifiers ON items(identifier);"
    "CREATE INDEX IF NOT EXISTS recents ON items(recency) WHERE flags = 0;"
    "CREATE INDEX IF NOT EXISTS favorites ON items(favorite) WHERE favorite IS NOT NULL;";

Error anotherFormat() {
  return Error::store(SQLITE_SCHEMA, "the index has another format");
}

}  // namespace

Result<std::int64_t> searchNumber(Database& database, const char* sql) {
  auto statement = database.prepare(sql);
  if (!statement) return fail(statement.error());
  const auto row = statement->step();
  if (!row) return fail(row.error());
  return *row ? statement->integer(0) : 0;
}

bool isDamagedIndex(const Error& error) {
  if (error.domain != ErrorDomain::store) return false;
  switch (error.code & 0xFF) {
    case SQLITE_PERM:
    case SQLITE_NOMEM:
    case SQLITE_READONLY:
    case SQLITE_CANTOPEN:
    case SQLITE_AUTH:
      return false;
    default:
      return true;
  }
}

void bindSearchRow(Statement& statement, const SearchRow& row) {
  const std::int64_t flags =
      (row.isFolder ? searchFolder : 0) | (row.isTrashed ? searchTrashed : 0);
  statement.bindBlob(1, row.identifier)
      .bindBlob(2, row.name)
      .bindBlob(3, row.tags)
      .bindBlob(4, row.type)
      .bind(5, row.modified)
      .bind(6, row.recency)
      .bind(7, row.favoriteOrder)
      .bindBlob(8, row.domain)
      .bind(9, flags);
}

Result<void> makeSearchTables(Database& database) {
  if (auto made = database.execute(tables); !made) return made;
  const std::string mark = "PRAGMA application_id=" + std::to_string(applicationID) +
                           ";PRAGMA user_version=" + std::to_string(formatVersion);
  if (auto marked = database.execute(mark.c_str()); !marked) return marked;
  auto folding = database.prepare("INSERT INTO facts VALUES('folding', ?)");
  if (!folding) return fail(folding.error());
  const std::string version = foldingVersion();
  return folding->bindBlob(1, version).run();
}

Result<void> makeSearchIndexes(Database& database) {
  return database.execute(indexes);
}

Result<void> requireSearchFormat(Database& database) {
  const auto application = searchNumber(database, "PRAGMA application_id");
  if (!application) return fail(application.error());
  const auto version = searchNumber(database, "PRAGMA user_version");
  if (!version) return fail(version.error());
  if (*application != applicationID || *version != formatVersion) return fail(anotherFormat());
  auto folding = database.prepare("SELECT value FROM facts WHERE name = 'folding'");
  if (!folding) return fail(folding.error());
  const auto row = folding->step();
  if (!row) return fail(row.error());
  if (!*row || folding->blob(0) != foldingVersion()) return fail(anotherFormat());
  return {};
}

}  // namespace mirabel
