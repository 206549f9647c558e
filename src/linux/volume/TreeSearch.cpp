#include "linux/volume/TreeSearch.h"

#include <algorithm>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <utility>
#include <vector>

#include "foundation/LookFailure.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

Result<bool> isFolder(int directory, const RawDirectory::Entry& entry) {
  if (entry.type != DT_UNKNOWN) return entry.type == DT_DIR;
  auto status = statusAt(directory, std::string(entry.name));
  if (!status && saysOutOfReach(status.error())) return false;
  if (!status) return fail(status.error());
  return status->kind == FileKind::folder;
}

// What can't be read for good reason holds nothing.
Result<void> unlessPassing(const Error& error) {
  return saysOutOfReach(error) ? Result<void>() : fail(error);
}

// Reads one folder; names of folders in it go to `below` when that is given.
Result<void> readFolder(const MonitoredRoots& roots, const std::string& path,
                        std::set<std::uint64_t>& wanted, const CandidateVisitor& visitor,
                        std::vector<std::string>* below) {
  auto opened = roots.open(path, O_RDONLY | O_DIRECTORY);
  if (!opened) return unlessPassing(opened.error());
  RawDirectory directory(std::move(*opened));
  while (!wanted.empty()) {
    auto next = directory.next();
    if (!next) return unlessPassing(next.error());
    if (!*next) break;
    const RawDirectory::Entry& entry = **next;
    if (entry.name == "." || entry.name == "..") continue;
    if (wanted.contains(entry.inode)) {
      auto isIt = visitor({path, directory.descriptor(), std::string(entry.name), entry.inode});
      if (!isIt) return fail(isIt.error());
      if (*isIt) wanted.erase(entry.inode);
    }
    if (below == nullptr) continue;
    auto folder = isFolder(directory.descriptor(), entry);
    if (!folder) return fail(folder.error());
    if (*folder) below->push_back(path + "/" + std::string(entry.name));
  }
  return {};
}

}  // namespace

Result<void> searchFolder(const MonitoredRoots& roots, const std::string& folderPath,
                          std::set<std::uint64_t>& wanted, const CandidateVisitor& visitor) {
  return readFolder(roots, folderPath, wanted, visitor, nullptr);
}

Result<void> searchRoots(const MonitoredRoots& roots, std::set<std::uint64_t>& wanted,
                         const CandidateVisitor& visitor) {
  std::vector<std::string> pending = roots.paths();
  std::ranges::reverse(pending);
  while (!pending.empty() && !wanted.empty()) {
    const std::string path = std::move(pending.back());
    pending.pop_back();
    if (auto read = readFolder(roots, path, wanted, visitor, &pending); !read) return read;
  }
  return {};
}

}  // namespace mirabel
