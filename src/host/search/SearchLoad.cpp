#include "host/search/SearchLoad.h"

#include <cerrno>
#include <utility>

#include "foundation/Log.h"
#include "host/search/SearchRow.h"
#include "host/search/SearchSchema.h"
#include "host/search/SearchText.h"
#include "items/LocalItem.h"

namespace mirabel {
namespace {

// A crash leaves nothing of this file, so that nothing of it need be on disk before the end. Rows
// wait in a table of their own, in a file without a name where they are many: the tables are filled
// in the order of modification, so that reading them from the end meets the newest first.
constexpr const char* preparation =
    "PRAGMA synchronous=OFF;"
    "PRAGMA temp_store=FILE;"
    "CREATE TEMP TABLE staged(identifier, name, tags, type, modified, recency, favorite, domain,"
    " flags);"
    "BEGIN";

// The words of some hundred thousand names; more are written in several pieces.
constexpr const char* bulkSettings =
    "INSERT INTO words(words, rank) VALUES('hashsize', 33554432);"
    "INSERT INTO words(words, rank) VALUES('automerge', 0)";
constexpr const char* usualSettings =
    "INSERT INTO words(words) VALUES('optimize');"
    "INSERT INTO words(words, rank) VALUES('hashsize', 1048576);"
    "INSERT INTO words(words, rank) VALUES('automerge', 4)";

}  // namespace

struct SearchLoad::Statements {
  Statement stage, unstage, unstageDomain;
};

SearchLoad::SearchLoad(const SearchFiles& files) : files_(files) {}

SearchLoad::~SearchLoad() {
  statements_.reset();
  if (!database_) return;
  database_.reset();
  files_.removeNew();
}

Result<std::unique_ptr<SearchLoad>> SearchLoad::begin(const SearchFiles& files) {
  if (auto made = files.makeNew(); !made) return fail(made.error());
  std::unique_ptr<SearchLoad> load(new SearchLoad(files));
  auto database = Database::open(files.newPath());
  if (!database) return fail(database.error());
  load->database_ = *std::move(database);
  if (auto prepared = load->prepare(); !prepared) return fail(prepared.error());
  return load;
}

Result<void> SearchLoad::prepare() {
  if (auto prepared = database_->execute(preparation); !prepared) return prepared;
  auto stage =
      database_->prepare("INSERT INTO staged VALUES(" + std::string(searchParameters) + ")");
  if (!stage) return fail(stage.error());
  auto unstage = database_->prepare("DELETE FROM staged WHERE identifier = ?");
  if (!unstage) return fail(unstage.error());
  auto unstageDomain = database_->prepare("DELETE FROM staged WHERE domain = ?");
  if (!unstageDomain) return fail(unstageDomain.error());
  statements_.reset(
      new Statements{*std::move(stage), *std::move(unstage), *std::move(unstageDomain)});
  return {};
}

Result<void> SearchLoad::add(const VesselItems& items) {
  const std::lock_guard lock(mutex_);
  for (const auto& item : items) {
    const SearchRow row = searchRowOf(*item);
    if (!hashes_.insert(std::hash<std::string>()(row.identifier)).second) {
      auto gone = statements_->unstage.bindBlob(1, row.identifier).run();
      if (!gone) return gone;
    }
    bindSearchRow(statements_->stage, 1, row);
    if (auto staged = statements_->stage.run(); !staged) return staged;
  }
  return {};
}

Result<void> SearchLoad::removeDomains(const std::vector<std::string>& domains) {
  const std::lock_guard lock(mutex_);
  if (!database_) return {};
  for (const std::string& domain : domains) {
    if (auto gone = statements_->unstageDomain.bindBlob(1, domain).run(); !gone) return gone;
  }
  return {};
}

Result<void> SearchLoad::finish(const Data& anchor) {
  const std::lock_guard lock(mutex_);
  if (auto made = makeSearchTables(*database_); !made) return made;
  if (auto moved = moveRows(); !moved) return moved;
  if (auto added = addWords(); !added) return added;
  if (auto made = makeSearchIndexes(*database_); !made) return made;
  return close(anchor);
}

Result<void> SearchLoad::moveRows() {
  const std::string columns = searchColumns;
  const std::string move = "INSERT INTO items(" + columns + ") SELECT " + columns +
                           " FROM staged ORDER BY modified, identifier";
  return database_->execute(move.c_str());
}

Result<void> SearchLoad::addWords() {
  if (auto set = database_->execute(bulkSettings); !set) return set;
  auto rows = database_->prepare("SELECT place, name, tags FROM items ORDER BY place");
  if (!rows) return fail(rows.error());
  auto add = database_->prepare("INSERT INTO words(rowid, text) VALUES(?, ?)");
  if (!add) return fail(add.error());
  std::string text;
  while (true) {
    const auto row = rows->step();
    if (!row) return fail(row.error());
    if (!*row) break;
    text = rows->blob(1);
    text += rows->blob(2);
    const std::string words = wordsOf(text);
    auto added = add->bind(1, rows->integer(0)).bindBlob(2, words).run();
    if (!added) return added;
  }
  return database_->execute(usualSettings);
}

Result<void> SearchLoad::close(const Data& anchor) {
  auto set = database_->prepare(setSearchAnchor);
  if (!set) return fail(set.error());
  if (auto stored = set->bindBlob(1, stringView(anchor)).run(); !stored) return stored;
  statements_.reset();
  *set = Statement(nullptr);
  if (auto committed = database_->execute("COMMIT"); !committed) return committed;
  if (auto moved = database_->checkpoint(Database::Log::emptied); !moved) return moved;
  database_.reset();
  return {};
}

}  // namespace mirabel
