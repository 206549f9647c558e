#include "linux/kernel/EntryPlace.h"

#include <cerrno>
#include <fcntl.h>

#include "foundation/URL.h"
#include "linux/kernel/LongPath.h"

namespace mirabel {

Result<EntryPlace> placeOf(const MonitoredRoots& roots, const URL& url) {
  const std::string& path = url.path();
  if (!url.isFileURL() || path.empty()) return fail(Error::posix(EINVAL));
  const auto root = roots.locate(path);
  const std::string_view last = url.lastPathComponent();
  const bool isEntry = root && !root->relative.empty() && last != "." && last != "..";
  EntryPlace place;
  if (isEntry) {
    place.folderPath = path.substr(0, path.size() - last.size() - 1);
    place.name = last;
  }
  auto folder = isEntry ? roots.openHolder(place.folderPath) : roots.open(path, O_PATH);
  if (!folder) return fail(folder.error());
  place.folder = std::move(*folder);
  return place;
}

Result<UniqueFd> openPlace(const EntryPlace& place, int flags) {
  constexpr int always = O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY;
  // "/proc/self/fd/N" is followed to the object, a symbolic link that is open included: opening
  // that for reading is refused with ELOOP.
  const std::string name =
      place.name.empty() ? "/proc/self/fd/" + std::to_string(place.folder.get()) : place.name;
  const int mask = place.name.empty() ? always & ~O_NOFOLLOW : always;
  const int fd = ::openat(place.folder.get(), name.c_str(), flags | mask);
  if (fd < 0) return fail(Error::posix(errno));
  return UniqueFd(fd);
}

}  // namespace mirabel
