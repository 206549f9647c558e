#pragma once

#include <memory>
#include <string>
#include <vector>

#include "host/search/SearchQuery.h"
#include "linux/volume/Database.h"

namespace mirabel {

/// Answers questions from the tables of a search index. Used under the lock of the index.
class SearchRun {
 public:
  [[nodiscard]] static Result<std::unique_ptr<SearchRun>> create(Database& database);
  ~SearchRun();
  SearchRun(const SearchRun&) = delete;
  SearchRun& operator=(const SearchRun&) = delete;

  /// See `SearchIndex`.
  [[nodiscard]] Result<std::vector<std::string>> search(const SearchQuery& query);
  [[nodiscard]] Result<std::vector<std::string>> recent(std::size_t limit);
  [[nodiscard]] Result<std::vector<std::string>> favorites();

 private:
  struct Statements;
  explicit SearchRun(std::unique_ptr<Statements> statements);
  std::unique_ptr<Statements> statements_;
};

}  // namespace mirabel
