#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/Error.h"
#include "foundation/Values.h"
#include "host/search/SearchRow.h"
#include "linux/volume/Database.h"

namespace mirabel {

/// The rows of a search index in its database, see docs/formats/search-index.md. Used under the
/// lock of the index. All changes are part of a transaction.
class SearchStore {
 public:
  /// Fills a database that holds nothing with empty tables. Errors: see `isDamagedIndex`; others
  /// of the database.
  [[nodiscard]] static Result<std::unique_ptr<SearchStore>> open(const std::string& path);

  ~SearchStore();
  SearchStore(const SearchStore&) = delete;
  SearchStore& operator=(const SearchStore&) = delete;

  [[nodiscard]] Database& database() { return *database_; }

  /// Runs `work` in a transaction: what it wrote is on disk when this returns without an error, and
  /// nothing of it otherwise.
  [[nodiscard]] Result<void> transaction(const std::function<Result<void>()>& work);

  [[nodiscard]] Result<std::optional<Data>> anchor();
  [[nodiscard]] Result<void> setAnchor(const Data& anchor);
  [[nodiscard]] Result<std::uint64_t> count();

  /// Stands for the item from now on.
  [[nodiscard]] Result<void> put(const SearchRow& row);
  /// Nothing happens where there is none.
  [[nodiscard]] Result<void> remove(std::string_view identifier);
  [[nodiscard]] Result<void> removeDomain(std::string_view domain);

 private:
  struct Statements;
  struct Known;  // what has to be known of a row to take it out
  explicit SearchStore(std::unique_ptr<Database> database);
  [[nodiscard]] Result<void> prepare();
  [[nodiscard]] Result<void> fillIfEmpty();
  [[nodiscard]] static Result<std::optional<Known>> find(Statement& statement,
                                                         std::string_view key);
  [[nodiscard]] Result<void> remove(const Known& known);
  [[nodiscard]] Result<void> add(const SearchRow& row);

  std::unique_ptr<Database> database_;
  std::unique_ptr<Statements> statements_;  // gone before the database
};

}  // namespace mirabel
