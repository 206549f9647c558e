#include "linux/kernel/MonitoredRoots.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <deque>
#include <fcntl.h>
#include <utility>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

bool holds(const std::string& root, std::string_view path) {
  if (!path.starts_with(root)) return false;
  return path.size() == root.size() || root == "/" || path[root.size()] == '/';
}

}  // namespace

/// What is open at a root's path now.
struct MonitoredRoots::Root {
  // Written by `refresh` alone. Whoever reads a descriptor that is replaced at that moment may use
  // it a little longer, so former ones are closed some changes later.
  std::atomic<int> descriptor = -1;
  std::atomic<std::uint64_t> device = 0;
  std::uint64_t inode = 0;
  UniqueFd current{};
  std::deque<UniqueFd> former{};

  void take(UniqueFd opened, const ObjectStatus& status) {
    constexpr std::size_t mostFormer = 8;
    inode = status.inode;
    device = status.device;
    descriptor = opened.get();
    former.push_back(std::exchange(current, std::move(opened)));
    if (former.size() > mostFormer) former.pop_front();
  }
};

MonitoredRoots::MonitoredRoots(std::vector<std::string> paths) : paths_(std::move(paths)) {
  for (std::size_t i = 0; i < paths_.size(); ++i)
    roots_.push_back(std::make_unique<Root>());
  static_cast<void>(refresh());
}

MonitoredRoots::~MonitoredRoots() = default;

bool MonitoredRoots::refresh() {
  bool hasChanged = false;
  for (std::size_t i = 0; i < paths_.size(); ++i) {
    Root& root = *roots_[i];
    const auto seen = statusOf(paths_[i]);
    const bool isThere = seen && seen->kind == FileKind::folder;
    if (!isThere && root.descriptor < 0) continue;
    if (isThere && root.descriptor >= 0 && seen->inode == root.inode &&
        seen->device == root.device) {
      continue;
    }
    auto opened = openLongPath(AT_FDCWD, paths_[i], O_PATH | O_DIRECTORY);
    const auto status = opened ? statusAt(opened->get(), "") : fail(opened.error());
    if (!status && root.descriptor < 0) continue;
    hasChanged = true;
    root.take(status ? std::move(*opened) : UniqueFd(), status.value_or(ObjectStatus{}));
  }
  return hasChanged;
}

std::optional<MonitoredRoots::Place> MonitoredRoots::locate(std::string_view path) const {
  std::optional<Place> best;
  for (std::size_t i = 0; i < paths_.size(); ++i) {
    if (!holds(paths_[i], path)) continue;
    // Of nested roots the innermost one owns the path.
    if (best && paths_[best->root].size() >= paths_[i].size()) continue;
    std::string_view relative = path.substr(paths_[i].size());
    if (relative.starts_with('/')) relative.remove_prefix(1);
    best = Place{i, relative};
  }
  return best;
}

int MonitoredRoots::descriptor(std::size_t root) const {
  return roots_[root]->descriptor;
}

Result<UniqueFd> MonitoredRoots::open(const std::string& path, int flags) const {
  if (path.find('\0') != std::string::npos) return fail(Error::posix(EINVAL));
  const int allFlags = flags | ((flags & O_PATH) != 0 ? 0 : O_NONBLOCK | O_NOCTTY);
  const auto place = locate(path);
  if (!place) return openLongPath(AT_FDCWD, path, allFlags);
  const int root = descriptor(place->root);
  if (root < 0) return fail(Error::posix(ENOENT));
  auto opened = openLongPath(root, std::string(place->relative), allFlags, resolveBeneath);
  if (!opened || place->relative.empty()) return opened;
  // A subvolume is no mount to the kernel, and gives out inode numbers of the root's once more.
  const auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  if (status->device != roots_[place->root]->device) return fail(Error::posix(EXDEV));
  return opened;
}

}  // namespace mirabel
