#include "linux/volume/IndexedPaths.h"

#include <algorithm>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/volume/DiskEntry.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {
namespace {

// More folders above each other than any path has; a longer chain is a damaged index.
constexpr int deepestFolder = 1 << 16;

}  // namespace

Result<std::optional<std::string>> IndexedPaths::pathOf(const Location& location) const {
  if (location.folder == 0) return location.name;
  auto folder = folderPath(location.folder);
  if (!folder || !*folder) return folder;
  return **folder + "/" + location.name;
}

Result<std::optional<std::string>> IndexedPaths::pathOfFolder(const ObjectRow& row) const {
  if (const std::string* found = store_.folderPaths().find(row.fileID)) return *found;
  auto path = pathOf(*row.location);
  if (path && *path) store_.folderPaths().add(row.fileID, *row.location, **path);
  return path;
}

// From the folder up to the first one whose path is known, and down again.
Result<std::optional<std::string>> IndexedPaths::folderPath(std::uint64_t folder) const {
  FolderPaths& known = store_.folderPaths();
  std::vector<ObjectRow> above;
  std::string path;
  for (std::uint64_t id = folder; id != 0; id = above.back().location->folder) {
    if (const std::string* found = known.find(id)) {
      path = *found;
      break;
    }
    auto row = store_.objectByFileID(id);
    if (!row) return fail(row.error());
    if (!*row || !(*row)->location || above.size() == deepestFolder) return std::nullopt;
    above.push_back(std::move(**row));
  }
  for (; !above.empty(); above.pop_back()) {
    const ObjectRow& row = above.back();
    if (row.location->folder != 0) path.append("/");
    path.append(row.location->name);
    known.add(row.fileID, *row.location, path);
  }
  return path;
}

Result<std::vector<std::uint64_t>> IndexedPaths::foldersAbove(const Location& location) const {
  std::vector<std::uint64_t> folders;
  for (std::uint64_t folder = location.folder; folder != 0 && folders.size() < deepestFolder;) {
    folders.push_back(folder);
    auto row = store_.objectByFileID(folder);
    if (!row) return fail(row.error());
    if (!*row || !(*row)->location) break;
    folder = (*row)->location->folder;
  }
  std::ranges::reverse(folders);
  return folders;
}

Result<std::optional<std::string>> IndexedPaths::standingPath(const ObjectRow& row,
                                                              const Location& location) const {
  auto path = pathOf(location);
  if (!path || !*path) return path;
  const auto look = lookAt(roots_, **path);
  if (!look && saysOutOfReach(look.error())) return std::nullopt;
  if (!look) return fail(look.error());
  if (look->seen.status.inode != row.inode) return std::nullopt;
  const auto fileSystem = fileSystemOf(look->seen, device_);
  if (!fileSystem && saysOutOfReach(fileSystem.error())) return std::nullopt;
  if (!fileSystem) return fail(fileSystem.error());
  const bool stands = *fileSystem == row.fileSystem && compare(row, look->seen) == Match::same;
  if (!stands) return std::nullopt;
  return path;
}

Result<std::vector<std::string>> IndexedPaths::standingPaths(const ObjectRow& row) const {
  auto names = store_.links(row.slot);
  if (!names) return fail(names.error());
  if (row.location) names->push_back(*row.location);
  std::vector<std::string> paths;
  for (const Location& name : *names) {
    auto path = standingPath(row, name);
    if (!path) return fail(path.error());
    if (*path) paths.push_back(std::move(**path));
  }
  return paths;
}

Result<bool> IndexedPaths::folderStands(const Location& location) const {
  auto folder = store_.objectByFileID(location.folder);
  if (!folder) return fail(folder.error());
  if (!*folder || !(*folder)->location) return false;
  return isAt(**folder, *(*folder)->location);
}

Result<bool> IndexedPaths::isAt(const ObjectRow& row, const Location& location) const {
  auto path = standingPath(row, location);
  if (!path) return fail(path.error());
  return path->has_value();
}

}  // namespace mirabel
