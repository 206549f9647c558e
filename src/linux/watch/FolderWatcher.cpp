#include "linux/watch/FolderWatcher.h"

#include "linux/watch/FanotifyWatcher.h"
#include "linux/watch/InotifyWatcher.h"

namespace mirabel {

const char* nameOf(WatcherKind kind) {
  switch (kind) {
    case WatcherKind::folderMarks:
      return "fanotify, a mark on each folder";
    case WatcherKind::fileSystemMark:
      return "fanotify, one mark on the file system";
    case WatcherKind::inotify:
      return "inotify, a watch on each folder";
  }
  return "";
}

Result<std::unique_ptr<FolderWatcher>> makeWatcher(WatcherKind kind) {
  return kind == WatcherKind::inotify ? InotifyWatcher::create() : FanotifyWatcher::create(kind);
}

Result<std::unique_ptr<FolderWatcher>> makeWatcher() {
  // Marks on folders also for the administrator: of one for the file system, which hears of
  // everything that anybody does there, most would be thrown away.
  auto watcher = makeWatcher(WatcherKind::folderMarks);
  if (watcher) return watcher;
  return makeWatcher(WatcherKind::inotify);
}

}  // namespace mirabel
