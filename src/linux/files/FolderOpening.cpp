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
  return OpenedFolder{std::move(*folder), status->device};
}

}  // namespace mirabel
