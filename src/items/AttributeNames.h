#pragma once

#include <string_view>

/// Extended attributes that keep this system's own state of a file; docs/formats/attributes.md
/// tells what is in them.
namespace mirabel::attributename {

inline constexpr std::string_view lastUsedDate = "com.norvane.lastuseddate#PS";
inline constexpr std::string_view tags = "com.norvane.metadata:_kMDItemUserTags";
inline constexpr std::string_view favoriteRank = "com.norvane.favorite-rank.number#PS";
inline constexpr std::string_view trashDate = "com.norvane.trash.time#PS";
inline constexpr std::string_view putBack = "com.norvane.trash.putback#PS";

}  // namespace mirabel::attributename
