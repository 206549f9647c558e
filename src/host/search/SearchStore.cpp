#include "host/search/SearchStore.h"

#include <utility>

#include "foundation/Log.h"
#include "host/search/SearchSchema.h"
#include "host/search/SearchText.h"

namespace mirabel {

struct SearchStore::Statements {
  Statement anchor, setAnchor, count, find, ofDomain, add, addWords, remove, removeWords, update;
};

struct SearchStore::Known {
  std::int64_t place = 0;
  std::string name;
  std::string tags;
  std::optional<std::int64_t> modified;
};

SearchStore::SearchStore(std::unique_ptr<Database> database) : database_(std::move(database)) {}
SearchStore::~SearchStore() = default;

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
  {
    auto any = database_->prepare("SELECT 1 FROM sqlite_schema");
    if (!any) return fail(any.error());
    const auto row = any->step();
    if (!row) return fail(row.error());
    if (*row) return {};
  }
  return transaction([this]() -> Result<void> {
    if (auto made = makeSearchTables(*database_); !made) return made;
    return makeSearchIndexes(*database_);
  });
}

Result<void> SearchStore::prepare() {
  const std::string columns = searchColumns;
  std::optional<Error> error;
  const auto make = [&](const std::string& sql) {
    auto statement = database_->prepare(sql);
    if (statement) return *std::move(statement);
    error = statement.error();
    return Statement(nullptr);
  };
  statements_.reset(new Statements{
      .anchor = make("SELECT value FROM facts WHERE name = 'anchor'"),
      .setAnchor = make(setSearchAnchor),
      .count = make("SELECT count(*) FROM items"),
      .find = make("SELECT place, name, tags, modified FROM items WHERE identifier = ?"),
      .ofDomain = make("SELECT place, name, tags, modified FROM items WHERE domain = ?"
                       " ORDER BY place LIMIT 1"),
      .add = make("INSERT INTO items(" + columns + ") VALUES(" + searchParameters + ")" +
                  " RETURNING place"),
      .addWords = make("INSERT INTO words(rowid, text) VALUES(?, ?)"),
      .remove = make("DELETE FROM items WHERE place = ?"),
      .removeWords = make("INSERT INTO words(words, rowid, text) VALUES('delete', ?, ?)"),
      .update = make("UPDATE items SET (" + columns + ") = (" + searchParameters + ")" +
                     " WHERE place = ?"),
  });
  if (error) return fail(*error);
  return {};
}

Result<void> SearchStore::transaction(const std::function<Result<void>()>& work) {
  if (auto begun = database_->execute("BEGIN IMMEDIATE"); !begun) return begun;
  auto done = work();
  if (done) done = database_->execute("COMMIT");
  if (done) return {};
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
  const auto known = find(statements_->find, row.identifier);
  if (!known) return fail(known.error());
  if (!*known) return add(row);
  const Known& former = **known;
  if (former.name != row.name || former.tags != row.tags || former.modified != row.modified) {
    // To the end: the newest are looked at first.
    if (auto removed = remove(former); !removed) return removed;
    return add(row);
  }
  Statement& update = statements_->update;
  bindSearchRow(update, 1, row);
  return update.bind(searchColumnCount + 1, former.place).run();
}

Result<void> SearchStore::remove(std::string_view identifier) {
  const auto known = find(statements_->find, identifier);
  if (!known) return fail(known.error());
  return *known ? remove(**known) : Result<void>();
}

Result<void> SearchStore::removeDomain(std::string_view domain) {
  while (true) {
    const auto known = find(statements_->ofDomain, domain);
    if (!known) return fail(known.error());
    if (!*known) return {};
    if (auto removed = remove(**known); !removed) return removed;
  }
}

Result<std::optional<SearchStore::Known>> SearchStore::find(Statement& statement,
                                                            std::string_view key) {
  const StatementScope scope(statement);
  statement.bindBlob(1, key);
  const auto row = statement.step();
  if (!row) return fail(row.error());
  if (!*row) return std::nullopt;
  Known known{statement.integer(0), std::string(statement.blob(1)), std::string(statement.blob(2)),
              std::nullopt};
  if (!statement.isNull(3)) known.modified = statement.integer(3);
  return known;
}

// The table of words forgets only what it is told to: exactly what it was given.
Result<void> SearchStore::remove(const Known& known) {
  const std::string words = wordsOf(known.name + known.tags);
  if (auto done = statements_->removeWords.bind(1, known.place).bindBlob(2, words).run(); !done) {
    return done;
  }
  return statements_->remove.bind(1, known.place).run();
}

Result<void> SearchStore::add(const SearchRow& row) {
  std::int64_t place = 0;
  {
    Statement& add = statements_->add;
    const StatementScope scope(add);
    bindSearchRow(add, 1, row);
    const auto added = add.step();
    if (!added) return fail(added.error());
    place = add.integer(0);
  }
  const std::string words = wordsOf(row.name + row.tags);
  return statements_->addWords.bind(1, place).bindBlob(2, words).run();
}

}  // namespace mirabel
