#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "items/LocalItem.h"

namespace mirabel {

/// What the index keeps of an item.
struct SearchRow {
  std::string identifier;
  std::string name;  ///< folded
  std::string tags;  ///< folded labels, each between newlines; empty without
  std::string type;
  std::optional<std::int64_t> modified{};       ///< see `searchTime`
  std::optional<std::int64_t> recency{};        ///< the later of modified and last used
  std::optional<std::int64_t> favoriteOrder{};  ///< orders like the rank, the lowest first
  std::string domain;                           ///< empty without
  bool isFolder = false;
  bool isTrashed = false;

  friend bool operator==(const SearchRow&, const SearchRow&) = default;
};

[[nodiscard]] SearchRow searchRowOf(const LocalItem& item);

/// Nanoseconds since 1970; what lies beyond the years that these reach is the nearest of them.
[[nodiscard]] std::int64_t searchTime(const Date& date);

/// A label as it stands in `SearchRow::tags`, newlines included.
[[nodiscard]] std::string searchTag(std::string_view label);

/// The bound of folded names and tags: what is longer is in no row. Names are shorter by nature,
/// and further tags are left out.
inline constexpr std::size_t longestSearchText = 4 << 10;

}  // namespace mirabel
