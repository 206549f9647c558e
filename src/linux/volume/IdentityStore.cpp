#include "linux/volume/IdentityStore.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "linux/volume/IdentityStatements.h"

namespace mirabel {
namespace {

constexpr std::uint64_t schemaVersion = 1;

// Kept in the database, so it must never change: FNV-1a, folded to 31 bits.
std::int64_t placeHash(std::string_view name) {
  std::uint64_t hash = 0xCBF29CE484222325;
  for (const char c : name)
    hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3;
  return static_cast<std::int64_t>((hash ^ (hash >> 32)) & 0x7FFFFFFF);
}

}  // namespace

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

IdentityStore::IdentityStore(Database& database) : database_(database) {}

IdentityStore::~IdentityStore() = default;

Result<void> IdentityStore::make() {
  if (auto tables = database_.execute(IdentityStatements::schema); !tables) return tables;
  if (auto prepared = prepare(); !prepared) return prepared;
  auto version = number("schema");
  if (!version) return fail(version.error());
  if (!*version) return setNumber("schema", schemaVersion);
  if (**version <= schemaVersion) return {};
  return fail(Error::store(0, "the database was written by a later version of this program"));
}

Result<void> IdentityStore::prepare() {
  auto statements = IdentityStatements::prepare(database_);
  if (!statements) return fail(statements.error());
  statements_ = std::move(*statements);
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

Result<bool> IdentityStore::hasNames(std::uint64_t folder) {
  if (mayHaveLinks_ || mayHaveHandovers_) return true;
  Statement& statement = statements_->anyChild.bind(1, folder);
  StatementScope scope(statement);
  return statement.step();
}

Result<void> IdentityStore::insert(const ObjectRow& row) {
  return write(statements_->insert, row);
}

Result<void> IdentityStore::put(const ObjectRow& row) {
  return write(statements_->update, row);
}

// The columns that are in indexes stay out of it: SQLite would write each index anew.
Result<void> IdentityStore::putState(const ObjectRow& row) {
  return statements_->updateState.bind(1, row.slot)
      .bind(2, static_cast<std::int64_t>(row.kind))
      .bind(3, row.birthTime)
      .bind(4, row.changeTime)
      .bind(5, std::int64_t{row.isSettled})
      .bind(6, row.modificationTime)
      .bind(7, row.size)
      .run();
}

Result<void> IdentityStore::write(Statement& statement, const ObjectRow& row) {
  folderPaths_.writes(row);
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
  folderPaths_.clear();
  return statements_->remove.bind(1, slot).run();
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
  if (!mayHaveLinks_) return std::vector<std::pair<std::string, std::uint64_t>>();
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
  if (!mayHaveLinks_) return std::nullopt;
  Statement& statement = statements_->linkAt.bind(1, folder).bindBlob(2, name);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return statement.unsignedInteger(0);
}

Result<std::vector<Location>> IdentityStore::links(std::uint64_t slot) {
  if (!mayHaveLinks_) return std::vector<Location>();
  return readLocations(statements_->linksOf.bind(1, slot));
}

Result<std::vector<Location>> IdentityStore::readLocations(Statement& statement) {
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

Result<std::optional<Handover>> IdentityStore::handoverAt(std::uint64_t folder,
                                                          std::string_view name) {
  if (!mayHaveHandovers_) return std::nullopt;
  Statement& statement = statements_->handoverAt.bind(1, folder).bindBlob(2, name);
  StatementScope scope(statement);
  auto found = statement.step();
  if (!found) return fail(found.error());
  if (!*found) return std::nullopt;
  return Handover{static_cast<std::uint32_t>(statement.integer(0)),
                  static_cast<ObjectKind>(statement.integer(1))};
}

Result<std::vector<Location>> IdentityStore::handoversOf(std::uint32_t documentID) {
  if (!mayHaveHandovers_) return std::vector<Location>();
  return readLocations(statements_->handoversOf.bind(1, std::int64_t{documentID}));
}

Result<void> IdentityStore::addHandover(const Location& location, const Handover& handover) {
  mayHaveHandovers_ = true;
  return statements_->addHandover.bind(1, location.folder)
      .bindBlob(2, location.name)
      .bind(3, std::int64_t{handover.documentID})
      .bind(4, static_cast<std::int64_t>(handover.kind))
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
