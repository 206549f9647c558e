#include "linux/volume/Reserve.h"

#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

namespace mirabel {
namespace {

constexpr const char* reserveFile = "reserve";
// The write-ahead log and the files that are replaced take some pages each.
constexpr off_t size = 512 << 10;
constexpr std::uint64_t fewestFree = 4 * size;

bool isForWantOfRoom(const Error& error) {
  if (error.domain == ErrorDomain::store) return (error.code & 0xFF) == SQLITE_FULL;
  return error.isPosix(ENOSPC) || error.isPosix(EDQUOT);
}

}  // namespace

void Reserve::make() const {
  struct stat status {};
  const int folder = folder_.descriptor();
  if (::fstatat(folder, reserveFile, &status, AT_SYMLINK_NOFOLLOW) == 0) return;
  // What was given up on a disk that is nearly full stays free for what comes next.
  struct statvfs disk {};
  if (::fstatvfs(folder, &disk) != 0 || disk.f_bavail * disk.f_frsize < fewestFree) return;
  const UniqueFd file(::openat(folder, reserveFile, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  // Half of it would be there next time, and taken for all of it.
  if (file && ::posix_fallocate(file.get(), 0, size) != 0) ::unlinkat(folder, reserveFile, 0);
}

bool Reserve::releaseAfter(const Error& failure) const {
  return isForWantOfRoom(failure) && ::unlinkat(folder_.descriptor(), reserveFile, 0) == 0;
}

}  // namespace mirabel
