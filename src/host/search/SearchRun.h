#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "host/search/SearchStore.h"
#include "host/search/SearchText.h"
#include "mirabel/SearchQuery.h"

namespace mirabel {

/// Answers questions from the tables of a search index. Used under the lock of the index.
class SearchRun {
 public:
  /// `store` outlives it.
  [[nodiscard]] static Result<std::unique_ptr<SearchRun>> create(SearchStore& store);
  ~SearchRun();
  SearchRun(const SearchRun&) = delete;
  SearchRun& operator=(const SearchRun&) = delete;

  /// See `SearchIndex`.
  [[nodiscard]] Result<std::vector<std::string>> search(const SearchQuery& query);
  [[nodiscard]] Result<std::vector<std::string>> recent(std::size_t limit);
  [[nodiscard]] Result<std::vector<std::string>> favorites();

 private:
  struct Statements;
  class Candidates;
  SearchRun(SearchStore& store, std::unique_ptr<Statements> statements);
  [[nodiscard]] Result<std::vector<std::int64_t>> placesOf(const std::string& expression);
  /// Whether there was nothing more to be collected.
  [[nodiscard]] Result<bool> collect(Candidates& candidates, Match worst);
  [[nodiscard]] Result<void> collectFromAll(Candidates& candidates);

  SearchStore& store_;
  std::unique_ptr<Statements> statements_;
};

}  // namespace mirabel
