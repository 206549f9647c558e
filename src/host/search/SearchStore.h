#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "host/search/SearchRow.h"
#include "host/search/SearchTimes.h"
#include "linux/volume/Database.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The rows of a search index in its database, see docs/formats/search-index.md. Used under the
/// lock of the index.
class SearchStore {
 public:
  /// Makes the tables in a database that holds nothing. Errors: see `isDamagedIndex`; others of the
  /// database.
  [[nodiscard]] static Result<std::unique_ptr<SearchStore>> open(const std::string& path);
  /// A new database for very many rows, which is good for nothing until `finishFilling`: in one
  /// transaction, and without the indexes that cost less in the end.
  [[nodiscard]] static Result<std::unique_ptr<SearchStore>> beginFilling(const std::string& path);
  /// Closes it: the file is complete, without a log, but not synchronised.
  [[nodiscard]] static Result<void> finishFilling(std::unique_ptr<SearchStore> store,
                                                  const Data& anchor);
  ~SearchStore();
  SearchStore(const SearchStore&) = delete;
  SearchStore& operator=(const SearchStore&) = delete;

  [[nodiscard]] Database& database() { return *database_; }
  /// When the items were modified, by their places; read when they are first asked for.
  [[nodiscard]] Result<const SearchTimes*> times();

  /// Runs `work` in a transaction: what it wrote is on disk when this returns without an error, and
  /// nothing of it otherwise.
  [[nodiscard]] Result<void> transaction(const std::function<Result<void>()>& work);

  [[nodiscard]] Result<std::optional<Data>> anchor();
  [[nodiscard]] Result<std::uint64_t> count();

  // What follows is part of a transaction, or fills a new database.

  [[nodiscard]] Result<void> setAnchor(const Data& anchor);
  /// Stands for the item from now on.
  [[nodiscard]] Result<void> put(const SearchRow& row);
  /// The same for an item that is not there.
  [[nodiscard]] Result<void> add(const SearchRow& row);
  /// Nothing happens where there is none.
  [[nodiscard]] Result<void> remove(std::string_view identifier);
  [[nodiscard]] Result<void> removeDomain(std::string_view domain);
  /// Adds the words of all this to the words that are found. A transaction ends with it.
  [[nodiscard]] Result<void> writeWords();

 private:
  struct Statements;
  struct Known;
  /// What the table of words has of a place, and is to have.
  struct Words {
    std::optional<std::string> former;
    std::optional<std::string> next;
  };
  explicit SearchStore(std::unique_ptr<Database> database);
  [[nodiscard]] Result<void> fillIfEmpty();
  [[nodiscard]] Result<void> prepare();
  [[nodiscard]] Result<std::optional<Known>> find(std::string_view identifier);
  [[nodiscard]] static Known knownOf(const Statement& row);
  [[nodiscard]] Result<void> remove(const Known& known);
  void setWords(std::int64_t place, std::optional<std::string> former,
                std::optional<std::string> next);

  std::unique_ptr<Database> database_;
  std::unique_ptr<Statements> statements_;  // gone before the database
  std::int64_t lastPlace_ = 0;
  SearchTimes times_;
  std::map<std::int64_t, Words> words_;  ///< to be written at the end of the transaction
};

}  // namespace mirabel
