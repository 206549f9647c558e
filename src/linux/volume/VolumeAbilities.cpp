#include "linux/volume/VolumeAbilities.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/xattr.h>

#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/VolumeUUID.h"

namespace mirabel {
namespace {

constexpr const char* attribute = "user.com.norvane.check";

Result<void> askForUserAttribute(int folder) {
  const std::string path = "/proc/self/fd/" + std::to_string(folder);
  const bool isKept = ::getxattr(path.c_str(), attribute, nullptr, 0) >= 0 || errno == ENODATA;
  if (!isKept) return fail(Error::posix(errno));
  return {};
}

Result<void> tryUserAttributes(int folder) {
  // A file without a name: nobody sees it, and it is gone with the descriptor.
  const UniqueFd file(::openat(folder, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
  // Not every file system has those; what asking for an attribute is answered tells as much.
  if (!file && errno == EOPNOTSUPP) return askForUserAttribute(folder);
  if (!file) return fail(Error::posix(errno));
  if (::fsetxattr(file.get(), attribute, "x", 1, 0) != 0) {
    return fail(Error::posix(errno));
  }
  return {};
}

}  // namespace

Result<VolumeAbilities> volumeAbilities(const std::string& folder) {
  auto opened = openLongPath(AT_FDCWD, folder, O_PATH | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  VolumeAbilities abilities;
  abilities.userAttributes = tryUserAttributes(opened->get());
  abilities.hasBirthTimes = status->hasBirthTime;
  abilities.hasHandles = handleAt(opened->get(), "").has_value();
  const auto uuid = kernelVolumeUUID(folder);
  abilities.hasUUID = uuid.has_value();
  return abilities;
}

}  // namespace mirabel
