#pragma once

#include <cstddef>

namespace mirabel {

/// Size of a database's pages, and how much at the end of each holds its sum.
inline constexpr std::size_t databasePageSize = 4096;
inline constexpr std::size_t pageSumSize = 8;

/// Name of a file layer for SQLite that ends each page of a database file with a digest of the
/// page and its number, and answers SQLITE_CORRUPT when a page that is read does not have it: so
/// that no byte of the file can change, and no end be missing, without being found out. The log
/// has sums of SQLite's own. For databases with pages of that size, that many bytes reserved and
/// exclusive locking. Null when it can't be had. Thread-safe.
[[nodiscard]] const char* summedFileLayer();

/// For `sqlite3_file_control`: sets an int to 1 when a page without its sum was read, else to 0.
inline constexpr int metWrongPage = 1000;

}  // namespace mirabel
