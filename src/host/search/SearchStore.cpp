#include "host/search/SearchStore.h"

#include <utility>
#include <vector>

#include "foundation/Log.h"
#include "host/search/SearchSchema.h"
#include "host/search/SearchText.h"

namespace mirabel {

namespace {

// Words of a million names or so are collected before they are written; of more, in several pieces
// that are made one in the end. Nothing of the file has to outlive a crash before that.
constexpr const char* fillingSettings =
    "PRAGMA synchronous=OFF;"
    "BEGIN;";
constexpr const char* wordsInOnePiece =
    "INSERT INTO words(words, rank) VALUES('hashsize', 33554432);"
    "INSERT INTO words(words, rank) VALUES('automerge', 0)";
constexpr const char* wordsAsUsual =
    "INSERT INTO words(words) VALUES('optimize');"
    "INSERT INTO words(words, rank) VALUES('hashsize', 1048576);"
    "INSERT INTO words(words, rank) VALUES('automerge', 4)";

}  // namespace

struct SearchStore::Statements {
  Statement anchor, setAnchor, count, find, ofDomain, add, addWords, remove, removeWords, update;
};

struct SearchStore::Known {
  std::int64_t place = 0;
  std::string name;
  std::string tags;
};

SearchStore::SearchStore(std::unique_ptr<Database> database) : database_(std::move(database)) {}

// A log that is left behind would be taken for that of another copy of the database.
SearchStore::~SearchStore() {
  statements_.reset();
  static_cast<void>(database_->checkpoint(Database::Log::emptied));
}

Result<std::unique_ptr<SearchStore>> SearchStore::open(const std::string& path) {
  auto database = Database::open(path);
  if (!database) return fail(database.error());
  std::unique_ptr<SearchStore> store(new SearchStore(std::move(*database)));
  if (auto filled = store->fillIfEmpty(); !filled) return fail(filled.error());
  if (auto known = requireSearchFormat(*store->database_); !known) return fail(known.error());
  if (auto prepared = store->prepare(); !prepared) return fail(prepared.error());
  return store;
}

Result<void> SearchStore::fillIfEmpty() {
  const auto tables = searchNumber(*database_, "SELECT count(*) FROM sqlite_schema");
  if (!tables) return fail(tables.error());
  if (*tables > 0) return {};
  return transaction([this]() -> Result<void> {
    if (auto made = makeSearchTables(*database_); !made) return made;
    return makeSearchIndexes(*database_);
  });
}

Result<std::unique_ptr<SearchStore>> SearchStore::beginFilling(const std::string& path) {
  auto opened = Database::open(path);
  if (!opened) return fail(opened.error());
  std::unique_ptr<SearchStore> store(new SearchStore(std::move(*opened)));
  Database& database = *store->database_;
  if (auto begun = database.execute(fillingSettings); !begun) return fail(begun.error());
  if (auto made = makeSearchTables(database); !made) return fail(made.error());
  if (auto set = database.execute(wordsInOnePiece); !set) return fail(set.error());
  if (auto prepared = store->prepare(); !prepared) return fail(prepared.error());
  return store;
}

Result<void> SearchStore::finishFilling(std::unique_ptr<SearchStore> store, const Data& anchor) {
  Database& database = *store->database_;
  if (auto written = store->writeWords(); !written) return written;
  if (auto set = database.execute(wordsAsUsual); !set) return set;
  if (auto made = makeSearchIndexes(database); !made) return made;
  if (auto set = store->setAnchor(anchor); !set) return set;
  if (auto committed = database.execute("COMMIT"); !committed) return committed;
  return database.checkpoint(Database::Log::emptied);
}

Result<void> SearchStore::prepare() {
  const auto lastPlace = searchNumber(*database_, "SELECT max(place) FROM items");
  if (!lastPlace) return fail(lastPlace.error());
  lastPlace_ = *lastPlace;
  const std::string columns = searchColumns;
  const std::string parameters = searchParameters;
  std::optional<Error> error;
  const auto make = [&](const std::string& sql) {
    auto statement = database_->prepare(sql);
    if (statement) return *std::move(statement);
    error = statement.error();
    return Statement(nullptr);
  };
  statements_.reset(new Statements{
      .anchor = make("SELECT value FROM facts WHERE name = 'anchor'"),
      .setAnchor = make("INSERT OR REPLACE INTO facts VALUES('anchor', ?)"),
      .count = make("SELECT count(*) FROM items"),
      .find = make("SELECT place, name, tags FROM items WHERE identifier = ?"),
      .ofDomain = make("SELECT place, name, tags FROM items WHERE domain = ?"),
      .add = make("INSERT INTO items(" + columns + ", place) VALUES(" + parameters + ", ?)"),
      .addWords = make("INSERT INTO words(rowid, text) VALUES(?, ?)"),
      .remove = make("DELETE FROM items WHERE place = ?"),
      .removeWords = make("INSERT INTO words(words, rowid, text) VALUES('delete', ?, ?)"),
      .update = make("UPDATE items SET (" + columns + ") = (" + parameters + ") WHERE place = ?"),
  });
  if (error) return fail(*error);
  return {};
}

Result<const SearchTimes*> SearchStore::times() {
  if (auto loaded = times_.load(*database_); !loaded) return fail(loaded.error());
  return &times_;
}

Result<void> SearchStore::transaction(const std::function<Result<void>()>& work) {
  if (auto begun = database_->execute("BEGIN IMMEDIATE"); !begun) return begun;
  auto done = work();
  if (done) done = writeWords();
  if (done) done = database_->execute("COMMIT");
  if (done) {
    times_.commit();
    return {};
  }
  words_.clear();
  times_.rollBack();
  if (auto undone = database_->execute("ROLLBACK"); !undone) {
    logDebug([&] { return "can't roll back; " + undone.error().description(); });
  }
  return done;
}

Result<std::optional<Data>> SearchStore::anchor() {
  Statement& statement = statements_->anchor;
  const StatementScope scope(statement);
  const auto row = statement.step();
  if (!row) return fail(row.error());
  if (!*row) return std::nullopt;
  return dataFromString(statement.blob(0));
}

Result<void> SearchStore::setAnchor(const Data& anchor) {
  return statements_->setAnchor.bindBlob(1, stringView(anchor)).run();
}

Result<std::uint64_t> SearchStore::count() {
  const StatementScope scope(statements_->count);
  const auto row = statements_->count.step();
  if (!row) return fail(row.error());
  return statements_->count.unsignedInteger(0);
}

Result<void> SearchStore::put(const SearchRow& row) {
  const auto known = find(row.identifier);
  if (!known) return fail(known.error());
  if (!*known) return add(row);
  const auto& [place, name, tags] = **known;
  if (name != row.name || tags != row.tags) {
    setWords(place, wordsOf(name + tags), wordsOf(row.name + row.tags));
  }
  times_.set(place, row.modified);
  Statement& update = statements_->update;
  bindSearchRow(update, row);
  return update.bind(searchColumnCount + 1, place).run();
}

Result<void> SearchStore::add(const SearchRow& row) {
  const std::int64_t place = ++lastPlace_;
  setWords(place, {}, wordsOf(row.name + row.tags));
  times_.set(place, row.modified);
  Statement& add = statements_->add;
  bindSearchRow(add, row);
  return add.bind(searchColumnCount + 1, place).run();
}

Result<void> SearchStore::remove(std::string_view identifier) {
  const auto known = find(identifier);
  if (!known) return fail(known.error());
  return *known ? remove(**known) : Result<void>();
}

Result<void> SearchStore::removeDomain(std::string_view domain) {
  std::vector<Known> all;
  {
    Statement& rows = statements_->ofDomain;
    const StatementScope scope(rows);
    rows.bindBlob(1, domain);
    while (true) {
      const auto row = rows.step();
      if (!row) return fail(row.error());
      if (!*row) break;
      all.push_back(knownOf(rows));
    }
  }
  for (const Known& known : all)
    if (auto removed = remove(known); !removed) return removed;
  return {};
}

Result<void> SearchStore::remove(const Known& known) {
  setWords(known.place, wordsOf(known.name + known.tags), {});
  return statements_->remove.bind(1, known.place).run();
}

Result<std::optional<SearchStore::Known>> SearchStore::find(std::string_view identifier) {
  Statement& row = statements_->find;
  const StatementScope scope(row);
  const auto isThere = row.bindBlob(1, identifier).step();
  if (!isThere) return fail(isThere.error());
  if (!*isThere) return std::nullopt;
  return knownOf(row);
}

SearchStore::Known SearchStore::knownOf(const Statement& row) {
  return {row.integer(0), std::string(row.blob(1)), std::string(row.blob(2))};
}

// Words ----------------------------------------------------------------------------------------

// The table of words forgets what it is told that it was given, letter for letter. A place that
// changes twice was given only what it had at first.
void SearchStore::setWords(std::int64_t place, std::optional<std::string> former,
                           std::optional<std::string> next) {
  const auto [entry, isNew] = words_.try_emplace(place, Words{std::move(former), {}});
  entry->second.next = std::move(next);
}

// In the order of places: each step back makes the table write a piece of its own.
Result<void> SearchStore::writeWords() {
  for (const auto& [place, words] : words_) {
    if (words.former) {
      auto removed = statements_->removeWords.bind(1, place).bindBlob(2, *words.former).run();
      if (!removed) return removed;
    }
    if (words.next) {
      auto added = statements_->addWords.bind(1, place).bindBlob(2, *words.next).run();
      if (!added) return added;
    }
  }
  words_.clear();
  return {};
}

}  // namespace mirabel
