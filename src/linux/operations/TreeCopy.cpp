#include "linux/operations/TreeCopy.h"

#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <sys/stat.h>

namespace mirabel {

Result<void> TreeCopy::run(int sourceFolder, const std::string& source, int folder,
                           const std::string& name) {
  const auto status = calls_.status(sourceFolder, source);
  if (!status) return fail(status.error());
  if (status->kind != FileKind::folder) {
    if (auto copied = copyObject({sourceFolder, source}, *status, {folder, name}, {}); !copied) {
      return copied;
    }
    return files_.flush();
  }
  auto from =
      calls_.openBelow(sourceFolder, source, O_PATH | O_DIRECTORY, FileCalls::Mounts::entered);
  if (!from) return fail(from.error());
  if (auto made = calls_.makeFolder(folder, name, 0700); !made) return made;
  auto copy = calls_.openBelow(folder, name, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!copy) return fail(copy.error());
  return copyTree(from->get(), copy->get());
}

Result<void> TreeCopy::copyTree(int source, int copy) {
  top_ = copy;
  folders_.assign(1, {});
  for (std::size_t i = 0; i < folders_.size(); ++i) {
    const std::string path = folders_[i];
    if (auto copied = copyFolder(source, copy, path); !copied)
      return fail(withPath(copied.error(), path));
  }
  if (auto flushed = files_.flush(); !flushed) return flushed;
  // Children first: a folder's time is set when nothing is added to it any more, and one that may
  // not be written is made so at last.
  for (auto path = folders_.rbegin(); path != folders_.rend(); ++path) {
    if (auto done = finishFolder(source, copy, *path); !done)
      return fail(withPath(done.error(), *path));
  }
  return {};
}

Result<void> TreeCopy::copyFolder(int source, int copy, const std::string& path) {
  auto from = calls_.openBelow(source, path, O_PATH | O_DIRECTORY, FileCalls::Mounts::entered);
  if (!from) return fail(from.error());
  auto to = calls_.openBelow(copy, path, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!to) return fail(to.error());
  auto entries = entriesOf(calls_, from->get());
  if (!entries) return fail(entries.error());
  for (const FolderEntry& entry : *entries) {
    const auto status = calls_.status(from->get(), entry.name);
    // Gone since the folder was read.
    if (!status && status.error().isPosix(ENOENT)) continue;
    if (!status) return fail(withPath(status.error(), pathBelow(path, entry.name)));
    auto copied = copyObject({from->get(), entry.name}, *status, {to->get(), entry.name},
                             pathBelow(path, entry.name));
    if (!copied) return fail(withPath(copied.error(), pathBelow(path, entry.name)));
  }
  return {};
}

Result<void> TreeCopy::copyObject(Place from, const ObjectStatus& status, Place to,
                                  const std::string& path) {
  if (status.kind == FileKind::regular) return copyFile(from, status, to, path);
  if (status.kind == FileKind::folder) {
    if (auto made = calls_.makeFolder(to.folder, to.name, 0700); !made) return made;
    folders_.push_back(path);
    progress_.entriesCopied.fetch_add(1, std::memory_order_relaxed);
    return {};
  }
  if (status.kind == FileKind::symbolicLink) {
    auto target = calls_.target(from.folder, from.name);
    if (!target) return fail(target.error());
    auto made = calls_.makeLink(*target, to.folder, to.name);
    if (!made) return made;
  } else if (S_ISFIFO(status.mode) || S_ISSOCK(status.mode)) {
    auto made = calls_.makeNode(to.folder, to.name,
                                (status.mode & S_IFMT) | (status.mode & copiedPermissions));
    if (!made) return made;
  } else {
    return fail(Error::posix(EPERM, "a device can't be copied"));
  }
  progress_.entriesCopied.fetch_add(1, std::memory_order_relaxed);
  return calls_.setTime(to.folder, to.name, status.modificationTime);
}

Result<void> TreeCopy::copyFile(Place from, const ObjectStatus& status, Place to,
                                const std::string& path) {
  const bool mayBeLinked = status.linkCount > 1 && !path.empty();
  if (mayBeLinked) {
    const auto known = linked_.find({status.device, status.inode});
    if (known != linked_.end() && known->second.size() < PATH_MAX &&
        calls_.link(top_, known->second, to.folder, to.name)) {
      return {};
    }
  }
  auto source = from.name.empty() ? calls_.reopen(from.folder, O_RDONLY)
                                  : calls_.open(from.folder, from.name, O_RDONLY);
  if (!source) return fail(source.error());
  auto copied = files_.copy(std::move(*source), to.folder, to.name);
  if (copied && mayBeLinked) linked_.emplace(std::pair(status.device, status.inode), path);
  return copied;
}

Result<void> TreeCopy::finishFolder(int source, int copy, const std::string& path) {
  auto from = calls_.openBelow(source, path, O_RDONLY | O_DIRECTORY, FileCalls::Mounts::entered);
  if (!from) return fail(from.error());
  auto to = calls_.openBelow(copy, path, O_RDONLY | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!to) return fail(to.error());
  const auto status = calls_.status(from->get());
  if (!status) return fail(status.error());
  if (auto done = files_.copyProperties(from->get(), *status, to->get()); !done) return done;
  return calls_.sync(to->get());
}

}  // namespace mirabel
