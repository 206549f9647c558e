#pragma once

#include <cstddef>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "linux/apps/EntryListing.h"
#include "linux/apps/EntryReader.h"

namespace mirabel {

/// Finds the entry of one application without going through all of them. Any thread may call it.
class EntryFinder {
 public:
  /// The directories are those of entries, the most important first.
  EntryFinder(std::vector<std::string> directories, EntryReader& reader,
              std::size_t mostDirectoryEntries);

  [[nodiscard]] const std::vector<std::string>& directories() const { return directories_; }

  /// See `listEntries`. Later searches find what is in folders below the directory where this saw
  /// it.
  [[nodiscard]] Result<std::vector<ListedEntry>> list(std::size_t directory, LeftOutList& leftOut);
  /// The entry that an enumeration would come by first. `identifier` is an
  /// `isApplicationIdentifier`. An entry in a folder below its directory that is newer than the
  /// last listing is not found. Errors are those of reading, and of listing.
  [[nodiscard]] Result<EntryReading> find(const std::string& identifier);

 private:
  using Paths = std::map<std::string, std::string>;  // by identifier
  [[nodiscard]] Result<EntryReading> findIn(std::size_t directory, const std::string& identifier);
  [[nodiscard]] Result<std::optional<std::string>> pathInFolders(std::size_t directory,
                                                                 const std::string& identifier);

  const std::vector<std::string> directories_;
  EntryReader& reader_;
  const std::size_t mostDirectoryEntries_;
  std::mutex mutex_;
  std::vector<std::optional<Paths>> inFolders_;  // by directory, once it was listed
};

}  // namespace mirabel
