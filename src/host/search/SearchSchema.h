#pragma once

#include <cstdint>

#include "host/search/SearchRow.h"
#include "linux/volume/Database.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Whether a new database would be free of what the error tells: damage, or another format.
[[nodiscard]] bool isDamagedIndex(const Error& error);

/// The columns of a row but its place, as they are bound and stored.
inline constexpr const char* searchColumns =
    "identifier, name, tags, type, modified, recency, favorite, domain, flags";
inline constexpr const char* searchParameters = "?, ?, ?, ?, ?, ?, ?, ?, ?";
inline constexpr int searchColumnCount = 9;
inline constexpr std::int64_t searchFolder = 1;
inline constexpr std::int64_t searchTrashed = 2;
/// Binds them to the first parameters. The row lives until the statement was run.
void bindSearchRow(Statement& statement, const SearchRow& row);

/// Makes the tables in an empty database, and the indexes where they are missing, which
/// cost less once the tables are filled. Part of a transaction.
[[nodiscard]] Result<void> makeSearchTables(Database& database);
[[nodiscard]] Result<void> makeSearchIndexes(Database& database);
/// What a query of one row and one column answers; 0 for null.
[[nodiscard]] Result<std::int64_t> searchNumber(Database& database, const char* sql);
/// Error: SQLITE_SCHEMA where the database was made by another version.
[[nodiscard]] Result<void> requireSearchFormat(Database& database);

}  // namespace mirabel
