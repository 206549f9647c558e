#include "linux/kernel/MonitoredRoots.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

bool holds(const std::string& root, std::string_view path) {
  if (!path.starts_with(root)) return false;
  return path.size() == root.size() || root == "/" || path[root.size()] == '/';
}

}  // namespace

MonitoredRoots::MonitoredRoots(std::vector<std::string> paths) : paths_(std::move(paths)) {
  for (const std::string& path : paths_) {
    auto opened = openLongPath(AT_FDCWD, path, O_PATH | O_DIRECTORY);
    const auto status = opened ? statusAt(opened->get(), "") : fail(opened.error());
    devices_.push_back(status ? status->device : 0);
    descriptors_.push_back(std::make_shared<UniqueFd>(opened ? std::move(*opened) : UniqueFd()));
  }
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
  return descriptors_[root]->get();
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
  if (status->device != devices_[place->root]) return fail(Error::posix(EXDEV));
  return opened;
}

}  // namespace mirabel
