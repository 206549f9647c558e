#include "linux/volume/VolumeAbilities.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/xattr.h>

#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/VolumeUUID.h"

namespace mirabel {
namespace {

Result<void> tryUserAttributes(int folder) {
  // A file without a name: nobody sees it, and it is gone with the descriptor.
  const UniqueFd file(::openat(folder, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
  if (!file) return fail(Error::posix(errno));
  if (::fsetxattr(file.get(), "user.com.norvane.check", "x", 1, 0) != 0) {
    return fail(Error::posix(errno));
  }
  return {};
}

}  // namespace

Result<VolumeAbilities> volumeAbilities(const std::string& path) {
  auto folder = openLongPath(AT_FDCWD, path, O_PATH | O_DIRECTORY);
  if (!folder) return fail(folder.error());
  auto status = statusAt(folder->get(), "");
  if (!status) return fail(status.error());
  VolumeAbilities abilities;
  abilities.userAttributes = tryUserAttributes(folder->get());
  abilities.hasBirthTimes = status->hasBirthTime;
  abilities.hasHandles = handleAt(folder->get(), "").has_value();
  const auto uuid = kernelVolumeUUID(path);
  abilities.hasUUID = uuid.has_value();
  return abilities;
}

}  // namespace mirabel
