#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "linux/watch/LookList.h"
#include "mirabel/Error.h"

namespace mirabel {

enum class WatcherKind {
  folderMarks,     ///< fanotify with a mark on each folder: for an ordinary user
  fileSystemMark,  ///< fanotify with one mark for the whole file system: for the administrator
  inotify,         ///< where the kernel lets this process have no fanotify
};
[[nodiscard]] const char* nameOf(WatcherKind kind);

/// Hears from the kernel what happens in folders of one file system. The kernel has queued the
/// record of every call that has returned, so whoever has drained the queue knows of all that was
/// done before. Used by one thread at a time, but for `descriptor`.
class FolderWatcher {
 public:
  virtual ~FolderWatcher() = default;

  /// Hears of that folder from now on, under the number `id`; again is harmless. `folder` may be
  /// open with O_PATH. POSIX errors: ENOSPC when the user has no further watches (see
  /// `WatchLimits`); EACCES for a folder that can't be read, of which nothing is heard but, as long
  /// as the folder that it lies in is watched, that its own attributes were changed; EXDEV for
  /// another file system.
  [[nodiscard]] virtual Result<void> watch(int folder, std::uint64_t id) = 0;
  /// Records of that folder are passed over from now on. The kernel may keep the mark until the
  /// folder, or the watcher, is gone.
  virtual void forget(std::uint64_t id) = 0;
  [[nodiscard]] virtual bool isWatched(std::uint64_t id) const = 0;
  [[nodiscard]] virtual std::size_t watchedFolders() const = 0;

  struct Drained {
    bool hasRecords = false;  ///< whether there was anything at all
    /// The kernel has dropped records: nothing can be concluded from those that are left.
    bool hasLost = false;
  };
  /// Takes in the records that were queued when it was called, and no later ones, so that a busy
  /// writer does not keep it from ending. POSIX errors: nothing can be concluded any more.
  [[nodiscard]] virtual Result<Drained> drain(LookList& looks) = 0;

  /// Readable when there are records.
  [[nodiscard]] virtual int descriptor() const = 0;
  [[nodiscard]] virtual WatcherKind kind() const = 0;
};

/// A watcher of that kind. POSIX errors: EPERM, ENOSYS or EINVAL where this process, or this
/// kernel, has none such; EMFILE when the user has no further ones.
[[nodiscard]] Result<std::unique_ptr<FolderWatcher>> makeWatcher(WatcherKind kind);
/// The best there is: marks on folders, else inotify.
[[nodiscard]] Result<std::unique_ptr<FolderWatcher>> makeWatcher();

}  // namespace mirabel
