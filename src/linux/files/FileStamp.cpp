#include "linux/files/FileStamp.h"

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "linux/files/ObjectLook.h"
#include "linux/kernel/LongPath.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

// Several ticks of the slowest clock that stamps files.
constexpr std::int64_t settlingTime = 100'000'000;

bool areOneObject(const ObjectStatus& a, const ObjectStatus& b) {
  return a.inode == b.inode && a.device == b.device && a.birthTime == b.birthTime;
}

UniqueFd openIfInMemory(const std::string& folder) {
  open_how how{};
  how.flags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
  how.resolve = RESOLVE_CACHED | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
  return UniqueFd(
      static_cast<int>(::syscall(SYS_openat2, AT_FDCWD, folder.c_str(), &how, sizeof(how))));
}

}  // namespace

bool FileStamp::isSameAs(const FileStamp& other) const {
  const ObjectStatus& a = file;
  const ObjectStatus& b = other.file;
  return areOneObject(folder, other.folder) && areOneObject(a, b) && a.changeTime == b.changeTime &&
         a.modificationTime == b.modificationTime && a.size == b.size && a.mode == b.mode &&
         a.owner == b.owner && a.linkCount == b.linkCount && isWritable == other.isWritable;
}

bool FileStamp::isSettled() const {
  return file.changeTime < file.seenAt - settlingTime;
}

std::optional<FileStamp> stampOf(const std::string& path) {
  const SplitPath place = splitPath(path);
  const UniqueFd folder = openIfInMemory(place.parent);
  if (!folder) return {};
  const auto folderStatus = statusAt(folder.get(), "");
  if (!folderStatus || !folderStatus->hasBirthTime) return {};
  const auto file = statusAt(folder.get(), place.name);
  if (!file || !file->hasBirthTime) return {};
  if (file->kind != FileKind::regular && file->kind != FileKind::folder) return {};
  return FileStamp{*folderStatus, *file, mayWrite(folder.get(), place.name)};
}

}  // namespace mirabel
