#include "linux/volume/IdentityStore.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace mirabel {
namespace {

constexpr std::uint64_t schemaVersion = 1;
// More folders above each other than any path has; a longer chain is a damaged index.
constexpr int deepestFolder = 1 << 20;

// Names are blobs: bytes, compared as bytes. The columns that a listing compares come first, the
// handle, which it seldom needs, last. Rows are appended; what is looked up by is in indexes of
// small integers, so that a folder of 100,000 touches few pages: `place` is a hash of the name.
// `file_id` is absent where it is the inode number.
constexpr const char* schema = R"(
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
CREATE TABLE IF NOT EXISTS links(
  folder INTEGER NOT NULL, name BLOB NOT NULL, slot INTEGER NOT NULL,
  PRIMARY KEY(folder, name)) WITHOUT ROWID;
CREATE INDEX IF NOT EXISTS links_slot ON links(slot);
CREATE TABLE IF NOT EXISTS handovers(
  folder INTEGER NOT NULL, name BLOB NOT NULL, document_id INTEGER NOT NULL,
  PRIMARY KEY(folder, name)) WITHOUT ROWID;
CREATE INDEX IF NOT EXISTS handovers_document ON handovers(document_id);
)";

#define OBJECT_COLUMNS                                                                        \
  "slot, inode, file_id, document_id, kind, folder, name, birth_time, change_time, settled, " \
  "modification_time, size, file_system, handle "

// Kept in the database, so it must never change: FNV-1a, folded to 31 bits.
std::int64_t placeHash(std::string_view name) {
  std::uint64_t hash = 0xCBF29CE484222325;
  for (const char c : name)
    hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3;
  return static_cast<std::int64_t>((hash ^ (hash >> 32)) & 0x7FFFFFFF);
}

}  // namespace

// In the order of the texts in `prepare`.
struct IdentityStore::Statements {
  std::vector<Statement> all;
  Statement& bySlot = all[0];
  Statement& byInode = all[1];
  Statement& byFileID = all[2];
  Statement& byDocument = all[3];
  Statement& byPlace = all[4];
  Statement& byForeign = all[5];
  Statement& slotOfInode = all[6];
  Statement& following = all[7];
  Statement& occupied = all[8];
  Statement& insert = all[9];
  Statement& update = all[10];
  Statement& remove = all[11];
  Statement& linkAt = all[12];
  Statement& linksOf = all[13];
  Statement& addLink = all[14];
  Statement& removeLink = all[15];
  Statement& anyLink = all[16];
  Statement& handoverAt = all[17];
  Statement& addHandover = all[18];
  Statement& removeHandovers = all[19];
  Statement& anyHandover = all[20];
  Statement& children = all[21];
  Statement& nameCount = all[22];
  Statement& linksIn = all[23];
  Statement& meta = all[24];
  Statement& setMeta = all[25];
};

Result<std::unique_ptr<IdentityStore>> IdentityStore::open(Database& database) {
  std::unique_ptr<IdentityStore> store(new IdentityStore(database));
  // All of it at once: a half-made schema would be taken for a damaged one.
  if (auto begun = database.execute("BEGIN"); !begun) return fail(begun.error());
  auto made = store->make();
  if (made) made = database.execute("COMMIT");
  if (!made) {
    static_cast<void>(database.execute("ROLLBACK"));
    return fail(made.error());
  }
  return store;
}

Result<void> IdentityStore::make() {
  if (auto tables = database_.execute(schema); !tables) return tables;
  if (auto prepared = prepare(); !prepared) return prepared;
  auto version = number("schema");
  if (!version) return fail(version.error());
  if (!*version) return setNumber("schema", schemaVersion);
  if (**version <= schemaVersion) return {};
  return fail(Error::store(0, "the database was written by a later version of this program"));
}

Result<void> IdentityStore::prepare() {
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
      "SELECT document_id FROM handovers WHERE folder = ?1 AND name = ?2",
      "INSERT OR REPLACE INTO handovers(folder, name, document_id) VALUES(?1,?2,?3)",
      "DELETE FROM handovers WHERE document_id = ?1",
      "SELECT EXISTS(SELECT 1 FROM handovers)",
      "SELECT " OBJECT_COLUMNS "FROM objects WHERE folder = ?1",
      "SELECT (SELECT count(*) FROM objects WHERE folder = ?1) + "
      "(SELECT count(*) FROM links WHERE folder = ?1)",
      "SELECT name, slot FROM links WHERE folder = ?1",
      "SELECT value FROM meta WHERE key = CAST(?1 AS TEXT)",
      "INSERT OR REPLACE INTO meta(key, value) VALUES(CAST(?1 AS TEXT), ?2)",
  };
  std::vector<Statement> made;
  for (const char* text : sql) {
    auto statement = database_.prepare(text);
    if (!statement) return fail(statement.error());
    made.push_back(std::move(*statement));
  }
  statements_ = std::shared_ptr<Statements>(new Statements{std::move(made)});
  const auto any = [](Statement& statement) -> Result<bool> {
    StatementScope scope(statement);
    auto row = statement.step();
    if (!row) return fail(row.error());
    return statement.integer(0) != 0;
  };
  auto links = any(statements_->anyLink);
  auto handovers = any(statements_->anyHandover);
  if (!links) return fail(links.error());
  if (!handovers) return fail(handovers.error());
  mayHaveLinks_ = *links;
  mayHaveHandovers_ = *handovers;
  return {};
}

Result<std::optional<ObjectRow>> IdentityStore::readObject(Statement& statement) {
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return objectIn(statement);
}

ObjectRow IdentityStore::objectIn(const Statement& statement) {
  ObjectRow row;
  row.slot = statement.unsignedInteger(0);
  row.inode = statement.unsignedInteger(1);
  row.fileID = statement.isNull(2) ? row.inode : statement.unsignedInteger(2);
  row.documentID = static_cast<std::uint32_t>(statement.integer(3));
  row.kind = static_cast<ObjectKind>(statement.integer(4));
  if (!statement.isNull(5)) {
    row.location = Location{statement.unsignedInteger(5), std::string(statement.blob(6))};
  }
  row.birthTime = statement.integer(7);
  row.changeTime = statement.integer(8);
  row.isSettled = statement.integer(9) != 0;
  row.modificationTime = statement.integer(10);
  row.size = statement.unsignedInteger(11);
  row.fileSystem = statement.unsignedInteger(12);
  row.handle = statement.blob(13);
  return row;
}

Result<std::optional<ObjectRow>> IdentityStore::objectInSlot(std::uint64_t slot) {
  return readObject(statements_->bySlot.bind(1, slot));
}

Result<std::optional<ObjectRow>> IdentityStore::objectByInode(std::uint64_t inode) {
  return readObject(statements_->byInode.bind(1, inode));
}

Result<std::optional<ObjectRow>> IdentityStore::objectByFileID(std::uint64_t fileID) {
  // Most objects have their inode number as file ID; the index holds the others only.
  if (fileID < upperFileIDs) {
    auto row = objectByInode(fileID);
    if (!row || (*row && (*row)->fileID == fileID)) return row;
  }
  return readObject(statements_->byFileID.bind(1, fileID));
}

Result<std::optional<ObjectRow>> IdentityStore::objectByDocumentID(std::uint32_t documentID) {
  // Most documents are the slot's own; the index holds those that were handed on.
  auto row = objectInSlot(documentID);
  if (!row || (*row && (*row)->documentID == documentID)) return row;
  return readObject(statements_->byDocument.bind(1, std::int64_t{documentID}));
}

Result<std::optional<ObjectRow>> IdentityStore::objectAt(std::uint64_t folder,
                                                         std::string_view name) {
  return readObject(
      statements_->byPlace.bind(1, folder).bindBlob(2, name).bind(3, placeHash(name)));
}

Result<std::optional<ObjectRow>> IdentityStore::foreignObject(std::uint64_t fileSystem,
                                                              std::uint64_t inode) {
  return readObject(statements_->byForeign.bind(1, fileSystem).bind(2, inode));
}

// Entries that were met one after the other have rows that follow each other, and a listing comes
// in the same order again: mostly the next row is the one, and costs no search.
Result<bool> IdentityStore::stepTo(std::uint64_t inode) {
  Statement& following = statements_->following;
  const auto isIt = [&] { return following.unsignedInteger(0) == inode && following.isNull(9); };
  if (isComparing_) {
    auto next = following.step();
    if (!next) return fail(next.error());
    isComparing_ = *next;
    if (*next && isIt()) return true;
  }
  Statement& search = statements_->slotOfInode.bind(1, inode);
  const StatementScope scope(search);
  auto found = search.step();
  if (!found || !*found) return found;
  following.reset();
  isComparing_ = false;
  auto row = following.bind(1, search.unsignedInteger(0)).step();
  if (!row) return fail(row.error());
  isComparing_ = *row;
  return *row && isIt();
}

void IdentityStore::endComparing() {
  statements_->following.reset();
  isComparing_ = false;
}

Result<KnownObject> IdentityStore::compareEntry(std::uint64_t inode, std::uint64_t folder,
                                                std::string_view name, ObjectKind kind,
                                                std::int64_t birthTime, std::int64_t changeTime) {
  auto found = stepTo(inode);
  if (!found) return fail(found.error());
  if (!*found) return KnownObject{};
  const Statement& row = statements_->following;
  if (row.unsignedInteger(4) != folder || row.integer(3) != static_cast<int>(kind) ||
      row.integer(6) != birthTime || row.integer(7) != changeTime || row.integer(8) == 0 ||
      row.blob(5) != name) {
    return KnownObject{Knowledge::different};
  }
  return KnownObject{Knowledge::unchanged, row.isNull(1) ? inode : row.unsignedInteger(1),
                     static_cast<std::uint32_t>(row.integer(2))};
}

Result<bool> IdentityStore::isOccupied(std::uint64_t folder, std::string_view name) {
  if (mayHaveLinks_) {
    auto link = linkAt(folder, name);
    if (!link) return fail(link.error());
    if (*link) return true;
  }
  if (mayHaveHandovers_) {
    auto handover = handoverAt(folder, name);
    if (!handover) return fail(handover.error());
    if (*handover) return true;
  }
  Statement& statement =
      statements_->occupied.bind(1, folder).bindBlob(2, name).bind(3, placeHash(name));
  StatementScope scope(statement);
  return statement.step();
}

Result<void> IdentityStore::insert(const ObjectRow& row) {
  return write(statements_->insert, row);
}

Result<void> IdentityStore::put(const ObjectRow& row) {
  return write(statements_->update, row);
}

Result<void> IdentityStore::write(Statement& statement, const ObjectRow& row) {
  const auto bindUnless = [&](int index, bool absent, std::uint64_t value) {
    absent ? statement.bindNull(index) : statement.bind(index, value);
  };
  statement.bind(1, row.slot).bind(2, row.inode);
  bindUnless(3, row.fileSystem == 0 && row.fileID == row.inode, row.fileID);
  bindUnless(4, row.documentID == 0, row.documentID);
  statement.bind(5, static_cast<std::int64_t>(row.kind));
  if (row.location) {
    statement.bind(6, row.location->folder).bindBlob(7, row.location->name);
    statement.bind(15, placeHash(row.location->name));
  } else {
    statement.bindNull(6).bindNull(7).bindNull(15);
  }
  statement.bind(8, row.birthTime).bind(9, row.changeTime).bind(10, std::int64_t{row.isSettled});
  statement.bind(11, row.modificationTime).bind(12, row.size);
  bindUnless(13, row.fileSystem == 0, row.fileSystem);
  statement.bindBlob(14, row.handle);
  return statement.run();
}

Result<void> IdentityStore::remove(std::uint64_t slot) {
  return statements_->remove.bind(1, slot).run();
}

Result<std::optional<std::string>> IdentityStore::pathOf(const Location& location) {
  std::vector<std::string> names{location.name};
  std::uint64_t folder = location.folder;
  for (int depth = 0; folder != 0; ++depth) {
    auto above = objectByFileID(folder);
    if (!above) return fail(above.error());
    if (!*above || !(*above)->location || depth == deepestFolder) return std::nullopt;
    names.push_back((*above)->location->name);
    folder = (*above)->location->folder;
  }
  std::string path = std::move(names.back());
  for (auto name = names.rbegin() + 1; name != names.rend(); ++name)
    path.append("/").append(*name);
  return path;
}

Result<std::vector<ObjectRow>> IdentityStore::childrenOf(std::uint64_t folder) {
  Statement& statement = statements_->children.bind(1, folder);
  StatementScope scope(statement);
  std::vector<ObjectRow> result;
  while (true) {
    auto found = statement.step();
    if (!found) return fail(found.error());
    if (!*found) return result;
    result.push_back(objectIn(statement));
  }
}

Result<std::uint64_t> IdentityStore::nameCount(std::uint64_t folder) {
  Statement& statement = statements_->nameCount.bind(1, folder);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  return statement.unsignedInteger(0);
}

Result<std::vector<std::pair<std::string, std::uint64_t>>> IdentityStore::linksIn(
    std::uint64_t folder) {
  Statement& statement = statements_->linksIn.bind(1, folder);
  StatementScope scope(statement);
  std::vector<std::pair<std::string, std::uint64_t>> result;
  while (true) {
    auto found = statement.step();
    if (!found) return fail(found.error());
    if (!*found) return result;
    result.emplace_back(std::string(statement.blob(0)), statement.unsignedInteger(1));
  }
}

Result<std::optional<std::uint64_t>> IdentityStore::linkAt(std::uint64_t folder,
                                                           std::string_view name) {
  Statement& statement = statements_->linkAt.bind(1, folder).bindBlob(2, name);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return statement.unsignedInteger(0);
}

Result<std::vector<Location>> IdentityStore::links(std::uint64_t slot) {
  if (!mayHaveLinks_) return std::vector<Location>();
  Statement& statement = statements_->linksOf.bind(1, slot);
  StatementScope scope(statement);
  std::vector<Location> result;
  while (true) {
    auto found = statement.step();
    if (!found) return fail(found.error());
    if (!*found) return result;
    result.push_back({statement.unsignedInteger(0), std::string(statement.blob(1))});
  }
}

Result<void> IdentityStore::addLink(const Location& location, std::uint64_t slot) {
  mayHaveLinks_ = true;
  return statements_->addLink.bind(1, location.folder)
      .bindBlob(2, location.name)
      .bind(3, slot)
      .run();
}

Result<void> IdentityStore::removeLink(std::uint64_t folder, std::string_view name) {
  return statements_->removeLink.bind(1, folder).bindBlob(2, name).run();
}

Result<std::optional<std::uint32_t>> IdentityStore::handoverAt(std::uint64_t folder,
                                                               std::string_view name) {
  Statement& statement = statements_->handoverAt.bind(1, folder).bindBlob(2, name);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return static_cast<std::uint32_t>(statement.integer(0));
}

Result<void> IdentityStore::addHandover(const Location& location, std::uint32_t documentID) {
  mayHaveHandovers_ = true;
  return statements_->addHandover.bind(1, location.folder)
      .bindBlob(2, location.name)
      .bind(3, std::int64_t{documentID})
      .run();
}

Result<void> IdentityStore::removeHandovers(std::uint32_t documentID) {
  if (!mayHaveHandovers_) return {};
  return statements_->removeHandovers.bind(1, std::int64_t{documentID}).run();
}

Result<std::optional<std::uint64_t>> IdentityStore::number(std::string_view key) {
  Statement& statement = statements_->meta.bindBlob(1, key);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return statement.unsignedInteger(0);
}

Result<void> IdentityStore::setNumber(std::string_view key, std::uint64_t value) {
  return statements_->setMeta.bindBlob(1, key).bind(2, value).run();
}

Result<std::optional<UUID>> IdentityStore::historyUUID() {
  Statement& statement = statements_->meta.bindBlob(1, "history");
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  const std::string_view bytes = statement.blob(0);
  UUID uuid;
  if (bytes.size() != uuid.bytes.size()) {
    return fail(Error::store(0, "the history's UUID has a wrong length"));
  }
  std::memcpy(uuid.bytes.data(), bytes.data(), bytes.size());
  return uuid;
}

Result<void> IdentityStore::setHistoryUUID(const UUID& uuid) {
  const std::string_view bytes(reinterpret_cast<const char*>(uuid.bytes.data()), uuid.bytes.size());
  return statements_->setMeta.bindBlob(1, "history").bindBlob(2, bytes).run();
}

}  // namespace mirabel
