#include "linux/operations/FolderCreation.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

constexpr mode_t permissions = 0777;

enum class Links { followed, refused };

Result<UniqueFd> openStep(int folder, const std::string& name, Links links) {
  if (links == Links::refused)
    return openLongPath(folder, name, O_PATH | O_DIRECTORY, resolveBeneath);
  UniqueFd opened(::openat(folder, name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!opened) return fail(Error::posix(errno));
  return opened;
}

// A subvolume is no mount, and still not a place of the root's.
bool isSameFileSystem(int folder, int next) {
  const auto above = statusAt(folder, "");
  const auto below = statusAt(next, "");
  return above && below && above->device == below->device;
}

Result<void> syncNames(int folder) {
  const UniqueFd opened(::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened) return errno == EACCES ? Result<void>() : fail(Error::posix(errno));
  return ::fsync(opened.get()) == 0 ? Result<void>() : fail(Error::posix(errno));
}

// Step by step on descriptors, so that a folder which is swapped meanwhile leads nowhere.
Result<void> createBelow(UniqueFd folder, std::string_view relative, Links links) {
  while (!relative.empty()) {
    const std::string name(relative.substr(0, relative.find('/')));
    relative.remove_prefix(std::min(relative.size(), name.size() + 1));
    const bool isMade = ::mkdirat(folder.get(), name.c_str(), permissions) == 0;
    if (!isMade && errno != EEXIST) {
      // A folder that may not be written can still hold the next one of the way.
      const int failure = errno;
      if (!openStep(folder.get(), name, links)) return fail(Error::posix(failure));
    }
    auto next = openStep(folder.get(), name, links);
    if (!next) return fail(next.error());
    if (isMade) {
      if (auto synced = syncNames(folder.get()); !synced) return synced;
    }
    if (links == Links::refused && !isSameFileSystem(folder.get(), next->get())) {
      return fail(Error::posix(EXDEV));
    }
    folder = std::move(*next);
  }
  return {};
}

}  // namespace

Result<void> createFolder(const MonitoredRoots& roots, const URL& url) {
  const std::string& path = url.path();
  if (path.empty()) return fail(Error::posix(EINVAL));
  const auto place = roots.locate(path);
  auto start = roots.open(place ? std::string(place->rootPath) : "/", O_PATH | O_DIRECTORY);
  if (!start) return fail(start.error());
  return place ? createBelow(std::move(*start), place->relative, Links::refused)
               : createBelow(std::move(*start), std::string_view(path).substr(1), Links::followed);
}

}  // namespace mirabel
