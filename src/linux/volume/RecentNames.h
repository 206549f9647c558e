#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/IndexContext.h"
#include "linux/volume/RecentPlaces.h"
#include "linux/watch/FolderWatcher.h"
#include "linux/watch/LookList.h"

namespace mirabel {

/// Collects the names that change from the records as they come.
class RecentNames {
 public:
  explicit RecentNames(const IndexContext& context) : context_(context) {}

  /// Adds the names that came or left.
  void add(const LookList& looks);
  void clear();
  /// Whether one of the names stands for a folder that `watcher` does not watch: nobody hears of
  /// what comes into it.
  [[nodiscard]] Result<bool> hasUnwatchedFolder(const FolderWatcher& watcher);
  /// See `RecentPlaces::placesOf`.
  [[nodiscard]] Result<std::vector<RecentPlace>> placesOf(std::uint64_t inode);

 private:
  struct Name {
    std::uint64_t folder;
    std::string name;
  };
  /// Nothing for one that is not there.
  [[nodiscard]] Result<std::optional<ObjectStatus>> statusOf(const Name& name) const;

  const IndexContext& context_;
  std::vector<Name> unseen_;   // not looked at yet
  std::vector<Name> folders_;  // of folders that came and may not be watched yet
  std::unordered_multimap<std::uint64_t, Name> byInode_;
};

}  // namespace mirabel
