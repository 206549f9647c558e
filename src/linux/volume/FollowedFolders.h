#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "linux/volume/Database.h"
#include "mirabel/Error.h"

namespace mirabel {

/// A root beside the document storage.
struct FollowedFolder {
  std::string path;
  /// What else is shown of it, such as its display name: another one is a change of the folder.
  std::string label;
};

/// Which folders are roots beside the document storage, under which version of the list, and up to
/// which event the history told of each version. Tables of the volume's database:
///
///     followed_folders(path BLOB PRIMARY KEY, label BLOB)
///     followed_versions(version INTEGER PRIMARY KEY, event INTEGER)
///
/// A row of the second holds the last event before anything was told of that version. Used under
/// the lock of the index, inside its transactions.
class FollowedFolders {
 public:
  /// The database outlives it.
  explicit FollowedFolders(Database& database) : database_(database) {}

  /// Reads the tables.
  [[nodiscard]] Result<void> load();

  [[nodiscard]] std::vector<std::string> paths() const;

  struct Difference {
    std::vector<std::string> come, gone, relabelled;
    bool isNewVersion = false;
    [[nodiscard]] bool isEmpty() const {
      return come.empty() && gone.empty() && relabelled.empty() && !isNewVersion;
    }
  };
  [[nodiscard]] Difference differenceTo(const std::vector<FollowedFolder>& folders,
                                        std::uint64_t version) const;
  /// Writes the rows; what this answers changes with `adopt`, when they are on disk.
  [[nodiscard]] Result<void> store(const std::vector<FollowedFolder>& folders,
                                   std::uint64_t version, std::uint64_t lastEvent);
  void adopt(const std::vector<FollowedFolder>& folders, std::uint64_t version,
             std::uint64_t lastEvent);

  /// The event up to which the history told of the folders of that version: of what came or went
  /// later it tells after it. The largest number when there was no later version; 0, from which no
  /// history can be replayed for long, when it is not known any more.
  [[nodiscard]] std::uint64_t lastEventUnder(std::uint64_t version) const;

  static constexpr std::size_t mostVersions = 1000;

 private:
  [[nodiscard]] bool isKnown(std::uint64_t version) const;

  Database& database_;
  std::map<std::string, std::string, std::less<>> folders_;  // labels by path
  std::map<std::uint64_t, std::uint64_t> versions_;          // last events before them
};

}  // namespace mirabel
