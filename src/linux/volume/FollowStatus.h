#pragma once

#include <cstddef>
#include <optional>

#include "linux/watch/FolderWatcher.h"
#include "linux/watch/WatchLimits.h"
#include "mirabel/Error.h"

namespace mirabel {

/// How the index is kept in step with the disk.
struct FollowStatus {
  /// How changes are heard of; nothing when every question is answered by a look at everything.
  std::optional<WatcherKind> watcher;
  std::size_t foldersWatched = 0;
  /// Marks that watching needs: one for each folder.
  std::size_t marksNeeded = 0;
  WatchLimits limits;
  /// Why nothing is watched, where it was tried.
  std::optional<Error> refusal;
  std::size_t unreadableFolders = 0;
};

}  // namespace mirabel
