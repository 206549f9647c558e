#include "linux/kernel/RawDirectory.h"

#include <cerrno>
#include <cstddef>
#include <cstring>
#include <dirent.h>
#include <sys/syscall.h>

namespace mirabel {
namespace {

// The kernel's record; glibc declares it only as part of its own readdir.
struct KernelEntry {
  std::uint64_t inode;
  std::int64_t position;
  unsigned short length;
  unsigned char type;
};
constexpr std::size_t nameOffset = offsetof(KernelEntry, type) + sizeof(KernelEntry::type);

}  // namespace

RawDirectory::RawDirectory(UniqueFd folder, std::size_t bufferSize)
    : folder_(std::move(folder)),
      capacity_(bufferSize),
      buffer_(std::make_unique_for_overwrite<char[]>(bufferSize)) {}

Result<std::optional<RawDirectory::Entry>> RawDirectory::next() {
  if (next_ == filled_) {
    const long count = ::syscall(SYS_getdents64, folder_.get(), buffer_.get(), capacity_);
    if (count < 0) return fail(Error::posix(errno));
    filled_ = static_cast<std::size_t>(count);
    next_ = 0;
    if (filled_ == 0) return std::nullopt;
  }
  const char* record = buffer_.get() + next_;
  KernelEntry entry;
  std::memcpy(&entry, record, nameOffset);
  next_ += entry.length;
  return Entry{std::string_view(record + nameOffset), entry.inode, entry.position, entry.type};
}

Result<void> RawDirectory::seek(std::int64_t position) {
  if (::lseek64(folder_.get(), position, SEEK_SET) < 0) return fail(Error::posix(errno));
  next_ = filled_ = 0;
  return {};
}

Result<void> RawDirectory::close() {
  if (::close(folder_.release()) != 0) return fail(Error::posix(errno));
  return {};
}

FileKind kindOfDirectoryType(unsigned char type) {
  switch (type) {
    case DT_REG:
      return FileKind::regular;
    case DT_DIR:
      return FileKind::folder;
    case DT_LNK:
      return FileKind::symbolicLink;
    default:
      return FileKind::other;
  }
}

}  // namespace mirabel
