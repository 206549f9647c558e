#include "linux/volume/VolumeUUID.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/ioctl.h>
#include <sys/statfs.h>
#include <sys/vfs.h>

#include "foundation/LookFailure.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

// The kernel's own declaration came with 6.9; older headers lack it.
struct KernelUUID {
  std::uint8_t length;
  std::uint8_t bytes[16];
};
#define MIRABEL_IOC_GETFSUUID _IOR(0x15, 0, KernelUUID)

Result<UUID> uuidFromFileSystemID(int folder) {
  struct statfs info;
  if (::fstatfs(folder, &info) != 0) return fail(Error::posix(errno));
  UUID uuid;
  static_assert(sizeof(info.f_fsid) == 8);
  std::memcpy(uuid.bytes.data(), &info.f_fsid, 8);
  const auto type = static_cast<std::uint64_t>(info.f_type);
  std::memcpy(uuid.bytes.data() + 8, &type, 8);
  // Version 8: a UUID of a make of its own.
  uuid.bytes[6] = static_cast<std::uint8_t>((uuid.bytes[6] & 0x0F) | 0x80);
  uuid.bytes[8] = static_cast<std::uint8_t>((uuid.bytes[8] & 0x3F) | 0x80);
  return uuid;
}

// The folder, or where it can't be read one above it on the same file system: it must not have
// another UUID, and its volume another state, while it is closed.
Result<UniqueFd> openReadable(const std::string& path) {
  auto opened = openLongPath(AT_FDCWD, path, O_RDONLY | O_DIRECTORY);
  if (opened || lookFailure(opened.error()) != LookFailure::closed) return opened;
  const auto status = statusOf(path);
  if (!status) return fail(status.error());
  for (std::string above = splitPath(path).parent;; above = splitPath(above).parent) {
    auto folder = openLongPath(AT_FDCWD, above, O_RDONLY | O_DIRECTORY);
    const auto seen = folder ? statusAt(folder->get(), "") : fail(folder.error());
    if (seen && seen->device == status->device) return folder;
    if (above == "/") return fail(Error::posix(EACCES, "\"" + path + "\""));
  }
}

std::optional<UUID> uuidFromKernel(int folder) {
  KernelUUID answer{};
  UUID uuid;
  if (::ioctl(folder, MIRABEL_IOC_GETFSUUID, &answer) != 0 || answer.length != uuid.bytes.size()) {
    return std::nullopt;
  }
  std::copy(std::begin(answer.bytes), std::end(answer.bytes), uuid.bytes.begin());
  if (uuid.isNil()) return std::nullopt;
  return uuid;
}

}  // namespace

std::optional<UUID> kernelVolumeUUID(const std::string& folder) {
  auto opened = openReadable(folder);
  if (!opened) return std::nullopt;
  return uuidFromKernel(opened->get());
}

Result<UUID> volumeUUID(const std::string& folder) {
  auto opened = openReadable(folder);
  if (!opened) return fail(opened.error());
  if (auto uuid = uuidFromKernel(opened->get())) return *uuid;
  return uuidFromFileSystemID(opened->get());
}

}  // namespace mirabel
