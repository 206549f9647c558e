#include "linux/operations/TreeRemoval.h"

#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <utility>

namespace mirabel {
namespace {

bool isFolder(const FileCalls& calls, int folder, const FolderEntry& entry) {
  if (entry.type != DT_UNKNOWN) return entry.type == DT_DIR;
  const auto status = calls.status(folder, entry.name);
  return status && status->kind == FileKind::folder;
}

}  // namespace

Result<void> TreeRemoval::examine(int top) {
  folders_.assign(1, {});
  for (std::size_t i = 0; i < folders_.size(); ++i) {
    const std::string path = folders_[i];
    auto folder = calls_.openBelow(top, path, O_RDONLY | O_DIRECTORY, FileCalls::Mounts::refused);
    if (!folder) return fail(withPath(folder.error(), path));
    auto entries = entriesOf(calls_, folder->get());
    if (!entries) return fail(withPath(entries.error(), path));
    if (entries->empty()) continue;
    if (auto allowed = calls_.mayChange(folder->get()); !allowed) {
      return fail(withPath(allowed.error(), path));
    }
    for (const FolderEntry& entry : *entries) {
      if (isFolder(calls_, folder->get(), entry)) folders_.push_back(pathBelow(path, entry.name));
    }
  }
  return {};
}

Result<void> TreeRemoval::run(int top) {
  Result<void> first;
  // Children before their parents, so that each folder is empty when its turn to go comes.
  for (auto path = folders_.rbegin(); path != folders_.rend(); ++path) {
    auto folder = calls_.openBelow(top, *path, O_RDONLY | O_DIRECTORY, FileCalls::Mounts::refused);
    auto emptied = folder ? emptyFolder(folder->get()) : fail(folder.error());
    if (!emptied && first && !emptied.error().isPosix(ENOENT)) {
      first = fail(withPath(emptied.error(), *path));
    }
  }
  return first;
}

Result<void> TreeRemoval::emptyFolder(int folder) {
  auto entries = entriesOf(calls_, folder);
  if (!entries) return fail(entries.error());
  Result<void> first;
  for (const FolderEntry& entry : *entries) {
    auto removed = removeEntry(folder, entry);
    if (removed) continue;
    // What is above it can't be emptied either, and need not be tried once more.
    looksAgain_ = false;
    if (first) first = removed;
  }
  return first;
}

Result<void> TreeRemoval::removeEntry(int folder, const FolderEntry& entry) {
  const bool looksLikeFolder = entry.type == DT_DIR;
  auto removed = calls_.remove(folder, entry.name, looksLikeFolder ? AT_REMOVEDIR : 0);
  // Another kind than it looked, or a folder that was filled since it was emptied.
  if (!removed && looksAgain_ &&
      (removed.error().isPosix(EISDIR) || removed.error().isPosix(ENOTEMPTY))) {
    removed = removeNewFolder(folder, entry.name);
  } else if (!removed && removed.error().isPosix(ENOTDIR)) {
    removed = calls_.remove(folder, entry.name, 0);
  }
  if (removed) hasRemoved_ = true;
  if (!removed && !removed.error().isPosix(ENOENT)) return removed;
  progress_.entriesRemoved.fetch_add(1, std::memory_order_relaxed);
  return {};
}

Result<void> TreeRemoval::removeNewFolder(int folder, const std::string& name) {
  auto opened = calls_.openBelow(folder, name, O_RDONLY | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!opened) return fail(opened.error());
  TreeRemoval inner(calls_, progress_);
  inner.looksAgain_ = false;
  if (auto examined = inner.examine(opened->get()); !examined) return examined;
  auto emptied = inner.run(opened->get());
  hasRemoved_ = hasRemoved_ || inner.hasRemoved_;
  if (!emptied) return emptied;
  return calls_.remove(folder, name, AT_REMOVEDIR);
}

}  // namespace mirabel
