#include "linux/files/LinuxDirectoryStreams.h"

#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <limits>
#include <linux/magic.h>
#include <string>
#include <sys/statfs.h>
#include <sys/utsname.h>

#include "linux/files/FolderOpening.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

// About a page of names: with more, each page that is resumed would read what it does not need.
constexpr std::size_t pageBuffer = 8u << 10;

// Before this one, positions on tmpfs counted the names that there were just then.
bool hasStableMemoryDirectories() {
  static const bool answer = [] {
    struct utsname system;
    if (::uname(&system) != 0) return false;
    int major = 0;
    int minor = 0;
    if (std::sscanf(system.release, "%d.%d", &major, &minor) != 2) return false;
    return major > 6 || (major == 6 && minor >= 6);
  }();
  return answer;
}

// Whether a position means the same to every opening of the folder, whatever other names come and
// go. Only what is known to do so: ext4 orders names by their hash, xfs and btrfs give each a
// number of its own for as long as it is there.
bool keepsPositions(int folder) {
  struct statfs fileSystem;
  if (::fstatfs(folder, &fileSystem) != 0) return false;
  switch (static_cast<unsigned long>(fileSystem.f_type)) {
    case EXT4_SUPER_MAGIC:
    case XFS_SUPER_MAGIC:
    case BTRFS_SUPER_MAGIC:
      return true;
    case TMPFS_MAGIC:
      return hasStableMemoryDirectories();
    default:
      return false;
  }
}

class Stream final : public DirectoryStream {
 public:
  explicit Stream(UniqueFd folder) : directory_(std::move(folder)) {}
  /// For a stream that begins at a position.
  Stream(UniqueFd folder, std::int64_t position)
      : directory_(std::move(folder), pageBuffer), position_(position) {}

  Result<void> seek() { return directory_.seek(position_); }

  std::optional<DirectoryEntry> next() override {
    auto entry = directory_.next();
    if (!entry || !*entry) return std::nullopt;
    position_ = (*entry)->position;
    return DirectoryEntry{(*entry)->name, kindOf(**entry)};
  }

  std::optional<std::uint64_t> position() override {
    if (position_ < 0 || !keepsPositions(directory_.descriptor())) return std::nullopt;
    return static_cast<std::uint64_t>(position_);
  }

  Result<void> close() override { return directory_.close(); }

 private:
  // Some file systems leave the kind out of their directories.
  FileKind kindOf(const RawDirectory::Entry& entry) const {
    if (entry.type != DT_UNKNOWN) return kindOfDirectoryType(entry.type);
    const auto status = statusAt(directory_.descriptor(), std::string(entry.name));
    return status ? status->kind : FileKind::other;
  }

  RawDirectory directory_;
  std::int64_t position_ = 0;  // behind the entry that was handed out last
};

}  // namespace

Result<std::unique_ptr<DirectoryStream>> LinuxDirectoryStreams::open(const URL& folder) {
  auto opened = openFolderForReading(roots_, folder.path());
  if (!opened) return fail(opened.error());
  return std::make_unique<Stream>(std::move(opened->descriptor));
}

Result<std::unique_ptr<DirectoryStream>> LinuxDirectoryStreams::openAt(const URL& folder,
                                                                       std::uint64_t position) {
  if (position > std::uint64_t{std::numeric_limits<std::int64_t>::max()}) {
    return fail(Error::posix(EINVAL));
  }
  auto opened = openFolderForReading(roots_, folder.path());
  if (!opened) return fail(opened.error());
  auto stream =
      std::make_unique<Stream>(std::move(opened->descriptor), static_cast<std::int64_t>(position));
  if (auto sought = stream->seek(); !sought) return fail(sought.error());
  return stream;
}

}  // namespace mirabel
