#include "linux/files/FileStamp.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "linux/files/ObjectLook.h"
#include "linux/kernel/LongPath.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

bool areOneObject(const ObjectStatus& a, const ObjectStatus& b) {
  return a.inode == b.inode && a.device == b.device && a.birthTime == b.birthTime;
}

UniqueFd openIfInMemory(int folder, const std::string& path) {
  open_how how{};
  how.flags = O_PATH | O_NOFOLLOW | O_CLOEXEC;
  how.resolve = RESOLVE_CACHED | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
  return UniqueFd(
      static_cast<int>(::syscall(SYS_openat2, folder, path.c_str(), &how, sizeof(how))));
}

// 0 where the kernel does not tell.
std::uint64_t mountOf(int object) {
  struct statx status;
  if (::statx(object, "", AT_EMPTY_PATH | AT_STATX_DONT_SYNC, STATX_MNT_ID, &status) != 0) return 0;
  return (status.stx_mask & STATX_MNT_ID) != 0 ? status.stx_mnt_id : 0;
}

}  // namespace

bool FileStamp::isSameAs(const FileStamp& other) const {
  const ObjectStatus& a = file;
  const ObjectStatus& b = other.file;
  return areOneObject(folder, other.folder) && folderMount == other.folderMount &&
         areOneObject(a, b) && fileMount == other.fileMount && a.changeTime == b.changeTime &&
         a.modificationTime == b.modificationTime && a.size == b.size && a.mode == b.mode &&
         a.owner == b.owner && a.linkCount == b.linkCount && isWritable == other.isWritable;
}

bool FileStamp::isSettled() const {
  return mirabel::isSettled(file.changeTime, file.seenAt);
}

std::optional<FileStamp> stampOf(const std::string& path) {
  const SplitPath place = splitPath(path);
  const UniqueFd folder = openIfInMemory(AT_FDCWD, place.parent);
  if (!folder) return {};
  const UniqueFd object = openIfInMemory(folder.get(), place.name);
  if (!object) return {};
  const auto folderStatus = statusAt(folder.get(), "");
  const auto status = statusAt(object.get(), "");
  if (!folderStatus || !folderStatus->hasBirthTime || !status || !status->hasBirthTime) return {};
  if (status->kind != FileKind::regular && status->kind != FileKind::folder) return {};
  FileStamp stamp{*folderStatus, *status, mountOf(folder.get()), mountOf(object.get())};
  if (stamp.folderMount == 0 || stamp.fileMount == 0) return {};
  stamp.isWritable = mayWrite(object.get(), "");
  return stamp;
}

}  // namespace mirabel
