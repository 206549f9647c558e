#include "linux/volume/IdentityStatements.h"

#include <utility>

namespace mirabel {

// Names are blobs: bytes, compared as bytes. The columns that a listing compares come first, the
// handle, which it seldom needs, last. Rows are appended; what is looked up by is in indexes of
// small integers, so that a folder of 100,000 touches few pages: `place` is a hash of the name.
// `file_id` is absent where it is the inode number.
const char* const IdentityStatements::schema = R"(
CREATE TABLE IF NOT EXISTS meta(key TEXT PRIMARY KEY, value NOT NULL) WITHOUT ROWID;
CREATE TABLE IF NOT EXISTS objects(
  slot INTEGER PRIMARY KEY,
  inode INTEGER NOT NULL,
  file_id INTEGER,
  document_id INTEGER,
  kind INTEGER NOT NULL,
  folder INTEGER,
  name BLOB,
  birth_time INTEGER NOT NULL,
  change_time INTEGER NOT NULL,
  settled INTEGER NOT NULL,
  modification_time INTEGER NOT NULL,
  size INTEGER NOT NULL,
  place INTEGER,
  file_system INTEGER,
  handle BLOB);
CREATE UNIQUE INDEX IF NOT EXISTS objects_inode ON objects(inode) WHERE file_system IS NULL;
CREATE UNIQUE INDEX IF NOT EXISTS objects_foreign ON objects(file_system, inode)
  WHERE file_system IS NOT NULL;
CREATE UNIQUE INDEX IF NOT EXISTS objects_file ON objects(file_id) WHERE file_id IS NOT NULL;
CREATE UNIQUE INDEX IF NOT EXISTS objects_document ON objects(document_id)
  WHERE document_id IS NOT NULL AND document_id <> slot;
CREATE INDEX IF NOT EXISTS objects_place ON objects(folder, place) WHERE folder IS NOT NULL;
CREATE INDEX IF NOT EXISTS objects_nowhere ON objects(place) WHERE folder IS NULL;
CREATE TABLE IF NOT EXISTS links(
  folder INTEGER NOT NULL, name BLOB NOT NULL, slot INTEGER NOT NULL,
  PRIMARY KEY(folder, name)) WITHOUT ROWID;
CREATE INDEX IF NOT EXISTS links_slot ON links(slot);
CREATE TABLE IF NOT EXISTS handovers(
  folder INTEGER NOT NULL, name BLOB NOT NULL, document_id INTEGER NOT NULL,
  kind INTEGER NOT NULL, PRIMARY KEY(folder, name)) WITHOUT ROWID;
CREATE INDEX IF NOT EXISTS handovers_document ON handovers(document_id);
CREATE TABLE IF NOT EXISTS followed_folders(
  path BLOB PRIMARY KEY, label BLOB NOT NULL) WITHOUT ROWID;
CREATE TABLE IF NOT EXISTS followed_versions(
  version INTEGER PRIMARY KEY, event INTEGER NOT NULL);
CREATE TABLE IF NOT EXISTS kept_attributes(
  file_id INTEGER NOT NULL, name BLOB NOT NULL, value BLOB,
  PRIMARY KEY(file_id, name)) WITHOUT ROWID;
)";

#define OBJECT_COLUMNS                                                                        \
  "slot, inode, file_id, document_id, kind, folder, name, birth_time, change_time, settled, " \
  "modification_time, size, file_system, handle "

Result<std::unique_ptr<IdentityStatements>> IdentityStatements::prepare(Database& database) {
  const char* const sql[] = {
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE slot = ?1",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE inode = ?1 AND file_system IS NULL",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE file_id = ?1",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE document_id = ?1 AND document_id <> slot",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE folder = ?1 AND place = ?3 AND name = ?2",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE file_system = ?1 AND inode = ?2",
      "SELECT slot FROM objects WHERE inode = ?1 AND file_system IS NULL",
      "SELECT inode, file_id, document_id, kind, folder, name, birth_time, change_time, settled, "
      "file_system FROM objects WHERE slot >= ?1",
      "SELECT 1 FROM objects WHERE folder = ?1 AND place = ?3 AND name = ?2",
      "INSERT INTO objects(" OBJECT_COLUMNS
      ", place) VALUES(?1,?2,?3,?4,?5,?6,?7,?8,?9,?10,?11,?12,?13,?14,?15)",
      "UPDATE objects SET inode=?2, file_id=?3, document_id=?4, kind=?5, folder=?6, name=?7, "
      "birth_time=?8, change_time=?9, settled=?10, modification_time=?11, size=?12, "
      "file_system=?13, handle=?14, place=?15 WHERE slot=?1",
      "DELETE FROM objects WHERE slot = ?1",
      "SELECT slot FROM links WHERE folder = ?1 AND name = ?2",
      "SELECT folder, name FROM links WHERE slot = ?1",
      "INSERT OR REPLACE INTO links(folder, name, slot) VALUES(?1,?2,?3)",
      "DELETE FROM links WHERE folder = ?1 AND name = ?2",
      "SELECT EXISTS(SELECT 1 FROM links)",
      "SELECT document_id, kind FROM handovers WHERE folder = ?1 AND name = ?2",
      "SELECT folder, name FROM handovers WHERE document_id = ?1",
      "INSERT OR REPLACE INTO handovers(folder, name, document_id, kind) VALUES(?1,?2,?3,?4)",
      "DELETE FROM handovers WHERE document_id = ?1",
      "SELECT EXISTS(SELECT 1 FROM handovers)",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE folder = ?1",
      "SELECT (SELECT count(*) FROM objects WHERE folder = ?1) + "
      "(SELECT count(*) FROM links WHERE folder = ?1)",
      "SELECT name, slot FROM links WHERE folder = ?1",
      "SELECT value FROM meta WHERE key = CAST(?1 AS TEXT)",
      "INSERT OR REPLACE INTO meta(key, value) VALUES(CAST(?1 AS TEXT), ?2)",
      "UPDATE objects SET kind=?2, birth_time=?3, change_time=?4, settled=?5, "
      "modification_time=?6, size=?7 WHERE slot=?1",
      "SELECT 1 FROM objects WHERE folder = ?1 LIMIT 1",
  };
  std::vector<Statement> made;
  for (const char* text : sql) {
    auto statement = database.prepare(text);
    if (!statement) return fail(statement.error());
    made.push_back(std::move(*statement));
  }
  return std::unique_ptr<IdentityStatements>(new IdentityStatements{std::move(made)});
}

}  // namespace mirabel
