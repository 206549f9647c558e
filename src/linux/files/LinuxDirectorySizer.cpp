#include "linux/files/LinuxDirectorySizer.h"

#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <string>
#include <unordered_set>
#include <vector>

#include "linux/files/FolderOpening.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

// What was a folder of ours a moment ago and now is gone, a link or a mount.
bool isNoLongerThere(const Error& error) {
  return error.isPosix(ENOENT) || error.isPosix(ENOTDIR) || error.isPosix(ELOOP) ||
         error.isPosix(EXDEV);
}

class SizeWalk {
 public:
  explicit SizeWalk(OpenedFolder top) : top_(std::move(top)) {}

  Result<std::uint64_t> run() {
    pending_.emplace_back();
    while (!pending_.empty()) {
      const std::string path = std::move(pending_.back());
      pending_.pop_back();
      // Opened anew from the top each time: one descriptor is enough for any depth.
      auto folder =
          openLongPath(top_.descriptor.get(), path, O_RDONLY | O_DIRECTORY, resolveBeneath);
      if (!folder && !path.empty() && isNoLongerThere(folder.error())) continue;
      if (!folder) return fail(folder.error());
      auto read = readFolder(path, RawDirectory(std::move(*folder)));
      if (!read) return fail(read.error());
    }
    return sum_;
  }

 private:
  Result<void> readFolder(const std::string& path, RawDirectory directory) {
    while (true) {
      auto entry = directory.next();
      if (!entry) return fail(entry.error());
      if (!*entry) return {};
      const std::string name((*entry)->name);
      if (name == "." || name == ".." || !mayCount((*entry)->type)) continue;
      auto status = statusAt(directory.descriptor(), name);
      if (!status && isNoLongerThere(status.error())) continue;
      if (!status) return fail(status.error());
      if (status->device == top_.device) add(path, name, *status);
    }
  }

  static bool mayCount(unsigned char type) {
    return type == DT_REG || type == DT_DIR || type == DT_UNKNOWN;
  }

  void add(const std::string& path, const std::string& name, const ObjectStatus& status) {
    if (status.kind == FileKind::folder)
      pending_.push_back(path.empty() ? name : path + "/" + name);
    if (status.kind != FileKind::regular) return;
    const bool isFirstName = status.linkCount < 2 || linked_.insert(status.inode).second;
    if (isFirstName) sum_ += status.size;
  }

  OpenedFolder top_;
  std::vector<std::string> pending_;  // relative to the top
  std::unordered_set<std::uint64_t> linked_;
  std::uint64_t sum_ = 0;
};

}  // namespace

Result<std::uint64_t> LinuxDirectorySizer::directorySize(const URL& folder) {
  auto top = openFolderForReading(roots_, folder.path());
  if (!top) return fail(top.error());
  return SizeWalk(std::move(*top)).run();
}

}  // namespace mirabel
