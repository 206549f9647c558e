#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "linux/apps/LeftOut.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Folders below a directory of entries that are looked into, one in the other.
inline constexpr unsigned deepestEntryFolder = 4;

struct ListedEntry {
  std::string identifier;    ///< plausible, see `isApplicationIdentifier`
  std::string relativePath;  ///< below the directory
  /// Something is there for sure: it is no link, which may lead to nothing.
  bool isThere = false;
};

/// The desktop entries of one directory by their names, in the order of their identifiers, each
/// identifier once. Reads up to `mostEntries` names, those in folders below it among them; symbolic
/// links to folders are not followed. A directory that is not there or may not be read is empty.
/// POSIX errors otherwise: nothing can be said of what is in it. What is refused goes to `leftOut`.
[[nodiscard]] Result<std::vector<ListedEntry>> listEntries(const std::string& directory,
                                                           std::size_t mostEntries,
                                                           LeftOutList& leftOut);

/// The folders below a directory of entries that `listEntries` looks into, as paths, the directory
/// itself first; as many as `most`. Empty when it can't be read.
[[nodiscard]] std::vector<std::string> foldersOfEntries(const std::string& directory,
                                                        std::size_t most);

}  // namespace mirabel
