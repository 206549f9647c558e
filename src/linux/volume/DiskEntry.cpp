#include "linux/volume/DiskEntry.h"

#include <fcntl.h>
#include <utility>

namespace mirabel {

Result<DiskEntry> lookAt(const MonitoredRoots& roots, const std::string& path) {
  const auto place = roots.locate(path);
  const bool isRoot = path == "/" || (place && place->relative.empty());
  const SplitPath split = isRoot ? SplitPath{path, ""} : splitPath(path);
  auto folder = isRoot ? roots.open(path, O_PATH | O_DIRECTORY) : roots.openHolder(split.parent);
  if (!folder) return fail(folder.error());
  auto status = statusAt(folder->get(), split.name);
  if (!status) return fail(status.error());
  SeenObject seen{folder->get(), split.name, *status};
  return DiskEntry{std::move(*folder), std::move(seen)};
}

}  // namespace mirabel
