#include "linux/files/FolderOpening.h"

#include <cerrno>
#include <fcntl.h>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {

Result<OpenedFolder> openFolderForReading(const MonitoredRoots& roots, const std::string& path) {
  if (path.empty()) return fail(Error::posix(EINVAL));
  auto folder = roots.open(path, O_RDONLY | O_DIRECTORY);
  if (!folder) return fail(folder.error());
  const auto status = statusAt(folder->get(), "");
  if (!status) return fail(status.error());
  const auto place = roots.locate(path);
  if (place && !place->relative.empty()) {
    const auto root = statusAt(roots.descriptor(place->root), "");
    if (!root) return fail(root.error());
    if (root->device != status->device) return fail(Error::posix(EXDEV));
  }
  return OpenedFolder{std::move(*folder), status->device};
}

}  // namespace mirabel
