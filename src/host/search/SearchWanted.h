#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/search/SearchText.h"
#include "mirabel/SearchQuery.h"

namespace mirabel {

/// A row as it is read; the texts live until the next one is.
struct SearchRowView {
  std::string_view name;
  std::string_view tags;
  std::string_view type;
  std::optional<std::int64_t> modified;
  std::string_view domain;
  bool isTrashed = false;
};

/// A query made ready to be compared with rows.
class SearchWanted {
 public:
  /// Nothing for one that no row can match.
  [[nodiscard]] static std::optional<SearchWanted> from(const SearchQuery& query);

  /// How well the worst of the words matches; nothing where the row is not wanted. Without words
  /// every match is as good.
  [[nodiscard]] std::optional<Match> match(const SearchRowView& row) const;

  /// An FTS5 expression that finds every row whose words match at least as well as that, and some
  /// others; of bounded length. Empty where trigrams can't tell.
  [[nodiscard]] std::string expression(Match worst) const;

 private:
  [[nodiscard]] bool passes(const SearchRowView& row) const;

  std::vector<std::string> words_;
  std::vector<std::string> tags_;
  std::optional<std::string> type_;  // a family ends in a slash
  std::optional<std::int64_t> since_;
  std::optional<std::int64_t> before_;
  std::optional<std::string> domain_;
  bool includesTrashed_ = false;
};

}  // namespace mirabel
