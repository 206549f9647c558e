#include "linux/volume/TreeSearch.h"

#include <algorithm>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <utility>
#include <vector>

#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

bool isFolder(int directory, const RawDirectory::Entry& entry) {
  if (entry.type != DT_UNKNOWN) return entry.type == DT_DIR;
  auto status = statusAt(directory, std::string(entry.name));
  return status && status->kind == FileKind::folder;
}

// Reads one folder; names of folders in it go to `below` when that is given.
void readFolder(const MonitoredRoots& roots, const std::string& path,
                std::set<std::uint64_t>& wanted, const CandidateVisitor& visitor,
                std::vector<std::string>* below) {
  auto opened = roots.open(path, O_RDONLY | O_DIRECTORY);
  if (!opened) return;
  RawDirectory directory(std::move(*opened));
  while (!wanted.empty()) {
    auto next = directory.next();
    if (!next || !*next) return;
    const RawDirectory::Entry& entry = **next;
    if (entry.name == "." || entry.name == "..") continue;
    if (wanted.contains(entry.inode) &&
        visitor({path, directory.descriptor(), std::string(entry.name), entry.inode})) {
      wanted.erase(entry.inode);
    }
    if (below != nullptr && isFolder(directory.descriptor(), entry)) {
      below->push_back(path + "/" + std::string(entry.name));
    }
  }
}

}  // namespace

void searchFolder(const MonitoredRoots& roots, const std::string& folderPath,
                  std::set<std::uint64_t>& wanted, const CandidateVisitor& visitor) {
  readFolder(roots, folderPath, wanted, visitor, nullptr);
}

void searchRoots(const MonitoredRoots& roots, std::set<std::uint64_t>& wanted,
                 const CandidateVisitor& visitor) {
  std::vector<std::string> pending = roots.paths();
  std::ranges::reverse(pending);
  while (!pending.empty() && !wanted.empty()) {
    const std::string path = std::move(pending.back());
    pending.pop_back();
    readFolder(roots, path, wanted, visitor, &pending);
  }
}

}  // namespace mirabel
