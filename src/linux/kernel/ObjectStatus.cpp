#include "linux/kernel/ObjectStatus.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <limits>
#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/utsname.h>
#include <sys/vfs.h>
#include <time.h>
#include <unistd.h>
#include <utility>

#include "linux/kernel/LongPath.h"

// Missing from older headers; kernels that do not know it answer EINVAL.
#ifndef AT_HANDLE_FID
#define AT_HANDLE_FID 0x200
#endif

namespace mirabel {
namespace {

std::int64_t nanoseconds(const statx_timestamp& stamp) {
  std::int64_t result = 0;
  if (__builtin_mul_overflow(stamp.tv_sec, nanosecondsPerSecond, &result) ||
      __builtin_add_overflow(result, static_cast<std::int64_t>(stamp.tv_nsec), &result)) {
    return stamp.tv_sec < 0 ? std::numeric_limits<std::int64_t>::min()
                            : std::numeric_limits<std::int64_t>::max();
  }
  return result;
}

FileKind kindOfMode(unsigned mode) {
  if (S_ISREG(mode)) return FileKind::regular;
  if (S_ISDIR(mode)) return FileKind::folder;
  if (S_ISLNK(mode)) return FileKind::symbolicLink;
  return FileKind::other;
}

ObjectStatus statusFrom(const struct statx& from) {
  ObjectStatus status;
  status.inode = from.stx_ino;
  status.device = makedev(from.stx_dev_major, from.stx_dev_minor);
  status.kind = kindOfMode(from.stx_mode);
  status.mode = from.stx_mode;
  status.owner = from.stx_uid;
  status.linkCount = from.stx_nlink;
  status.size = from.stx_size;
  status.attributes = from.stx_attributes;
  status.hasBirthTime = (from.stx_mask & STATX_BTIME) != 0;
  if (status.hasBirthTime) status.birthTime = nanoseconds(from.stx_btime);
  // Asking for the change time is what makes newer kernels give the next change a time of its own.
  status.changeTime = nanoseconds(from.stx_ctime);
  status.modificationTime = nanoseconds(from.stx_mtime);
  return status;
}

// Nanoseconds since 1970 on the clock that stamps files.
std::int64_t coarseNow() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME_COARSE, &now);
  return now.tv_sec * nanosecondsPerSecond + now.tv_nsec;
}

bool isKernelBefore(int wantedMajor, int wantedMinor) {
  utsname system{};
  int major = 0, minor = 0;
  if (::uname(&system) != 0) return true;
  if (std::sscanf(system.release, "%d.%d", &major, &minor) != 2) return true;
  return major < wantedMajor || (major == wantedMajor && minor < wantedMinor);
}

// Where what is open lies, if it has a name still.
std::string pathOfDescriptor(int descriptor) {
  std::array<char, PATH_MAX> path;
  const std::string link = "/proc/self/fd/" + std::to_string(descriptor);
  const ssize_t length = ::readlink(link.c_str(), path.data(), path.size());
  return length > 0 ? std::string(path.data(), static_cast<std::size_t>(length)) : std::string();
}

// The kernel itself knows, without asking the file system that is mounted there.
bool isMountPoint(int directory, const char* name) {
  if (*name == '\0' && directory >= 0) {
    const std::string path = pathOfDescriptor(directory);
    return !path.empty() && isMountPoint(AT_FDCWD, path.c_str());
  }
  const SplitPath place = splitPath(name);
  if (place.name.empty()) return false;
  UniqueFd parent;
  if (!place.parent.empty()) {
    auto opened = openLongPath(directory, place.parent, O_PATH | O_DIRECTORY);
    if (!opened) return false;
    parent = std::move(*opened);
  }
  const int folder = parent ? parent.get() : directory;
  const auto entry = openLongPath(folder, place.name, O_PATH, RESOLVE_NO_XDEV);
  return !entry && entry.error().isPosix(EXDEV);
}

Error lookError(int directory, const char* name, int value) {
  // What a mount answers whose server or device has gone.
  constexpr int dead[] = {ENOTCONN, ESTALE, EIO, EHOSTDOWN, ETIMEDOUT, ENODEV};
  const bool mayBeDead = std::ranges::find(dead, value) != std::end(dead);
  if (mayBeDead && isMountPoint(directory, name)) return Error::posix(EXDEV);
  return kernelError(value);
}

Result<ObjectStatus> look(int directory, const char* name, int links = AT_SYMLINK_NOFOLLOW) {
  const std::int64_t now = coarseNow();
  struct statx buffer;
  const int flags = links | AT_NO_AUTOMOUNT | (*name == '\0' ? AT_EMPTY_PATH : 0);
  if (::statx(directory, name, flags, STATX_BASIC_STATS | STATX_BTIME, &buffer) != 0) {
    return fail(lookError(directory, name, errno));
  }
  ObjectStatus status = statusFrom(buffer);
  status.seenAt = now;
  return status;
}

// Room for the kernel's largest handle, laid out as the kernel fills it.
struct HandleBuffer {
  alignas(file_handle) std::array<char, sizeof(file_handle) + MAX_HANDLE_SZ> bytes{};
  file_handle* handle() { return reinterpret_cast<file_handle*>(bytes.data()); }
};

bool readHandle(int directory, const char* name, HandleBuffer& buffer, int flags) {
  buffer.handle()->handle_bytes = MAX_HANDLE_SZ;
  int mount = 0;
  const int empty = *name == '\0' ? AT_EMPTY_PATH : 0;
  return ::name_to_handle_at(directory, name, buffer.handle(), &mount, flags | empty) == 0;
}

}  // namespace

Result<ObjectStatus> statusAt(int directory, const std::string& name) {
  return look(directory, name.c_str());
}

Result<ObjectStatus> statusOf(const std::string& path) {
  if (path.size() < longPathThreshold) return look(AT_FDCWD, path.c_str());
  auto parent = openLongPath(AT_FDCWD, splitPath(path).parent, O_PATH | O_DIRECTORY);
  if (!parent) return fail(parent.error());
  return look(parent->get(), splitPath(path).name.c_str());
}

Result<ObjectStatus> statusOfTarget(const std::string& path) {
  return look(AT_FDCWD, path.c_str(), 0);
}

std::optional<std::string> handleAt(int directory, const std::string& name) {
  // File systems that can name an object but not open it by that name only give the first form,
  // kernels before 6.5 only the second. Where both are given they are the same bytes.
  HandleBuffer buffer;
  if (!readHandle(directory, name.c_str(), buffer, AT_HANDLE_FID) &&
      !readHandle(directory, name.c_str(), buffer, 0)) {
    return std::nullopt;
  }
  const file_handle& handle = *buffer.handle();
  std::string result(sizeof(handle.handle_type) + handle.handle_bytes, '\0');
  std::memcpy(result.data(), &handle.handle_type, sizeof(handle.handle_type));
  std::memcpy(result.data() + sizeof(handle.handle_type), handle.f_handle, handle.handle_bytes);
  return result;
}

bool isCoarseStamp(std::int64_t time) {
  constexpr std::int64_t finestCoarse = 10'000'000;
  return time % finestCoarse == 0;
}

bool isSettled(std::int64_t changeTime, std::int64_t seenAt) {
  // Clocks that stamp files step by up to 10 ms; ten steps leave no doubt. FAT steps by two
  // seconds.
  constexpr std::int64_t settlingTime = 100'000'000;
  constexpr std::int64_t coarseSettlingTime = 3 * nanosecondsPerSecond;
  return changeTime < seenAt - (isCoarseStamp(changeTime) ? coarseSettlingTime : settlingTime);
}

bool timesAreCoarse(int object) {
  static const bool kernelIsOld = isKernelBefore(6, 13);
  if (kernelIsOld) return true;
  constexpr decltype(statfs::f_type) fine[] = {EXT4_SUPER_MAGIC, XFS_SUPER_MAGIC, BTRFS_SUPER_MAGIC,
                                               TMPFS_MAGIC};
  struct statfs info;
  if (::fstatfs(object, &info) != 0) return true;
  return std::ranges::find(fine, info.f_type) == std::end(fine);
}

std::vector<std::uint64_t> inodesIn(std::string_view handle) {
  constexpr std::size_t typeSize = sizeof(file_handle::handle_type);
  std::vector<std::uint64_t> numbers;
  for (std::size_t at = typeSize; at + sizeof(std::uint32_t) <= handle.size(); at += 4) {
    std::uint64_t number = 0;
    std::memcpy(&number, handle.data() + at, sizeof(std::uint32_t));
    numbers.push_back(number);
    if (at + sizeof(number) > handle.size()) continue;
    std::memcpy(&number, handle.data() + at, sizeof(number));
    numbers.push_back(number);
  }
  return numbers;
}

Date dateFromNanoseconds(std::int64_t nanosecondsSince1970) {
  std::int64_t seconds = nanosecondsSince1970 / nanosecondsPerSecond;
  std::int64_t rest = nanosecondsSince1970 % nanosecondsPerSecond;
  if (rest < 0) {
    rest += nanosecondsPerSecond;
    --seconds;
  }
  return Date{seconds, static_cast<std::uint32_t>(rest)};
}

}  // namespace mirabel
