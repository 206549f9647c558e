#include "linux/volume/RecentNames.h"

#include <utility>

#include "foundation/LookFailure.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

Result<std::optional<std::string>> pathOf(const IndexContext& context, std::uint64_t folder) {
  auto row = context.store.objectByFileID(folder);
  if (!row) return fail(row.error());
  if (!*row || !(*row)->location) return std::nullopt;
  return context.paths.pathOf(*(*row)->location);
}

}  // namespace

void RecentNames::add(const LookList& looks) {
  for (const auto& [folder, names] : looks.folders()) {
    for (const auto& [name, look] : names) {
      if (!look.entryChanged || name.empty()) continue;
      unseen_.push_back({folder, name});
      if (look.isOfFolder) folders_.push_back({folder, name});
    }
  }
}

void RecentNames::clear() {
  unseen_.clear();
  folders_.clear();
  byInode_.clear();
}

Result<std::vector<RecentPlace>> RecentNames::placesOf(std::uint64_t inode) {
  for (; !unseen_.empty(); unseen_.pop_back()) {
    const auto status = statusOf(unseen_.back());
    if (!status) return fail(status.error());
    if (*status) byInode_.emplace((*status)->inode, unseen_.back());
  }
  std::vector<RecentPlace> places;
  const auto [begin, end] = byInode_.equal_range(inode);
  for (auto found = begin; found != end; ++found) {
    auto path = pathOf(context_, found->second.folder);
    if (!path) return fail(path.error());
    if (*path) places.push_back({std::move(**path), found->second.name});
  }
  return places;
}

Result<bool> RecentNames::hasUnwatchedFolder(const FolderWatcher& watcher) {
  for (; !folders_.empty(); folders_.pop_back()) {
    const auto status = statusOf(folders_.back());
    if (!status) return fail(status.error());
    const bool mayBeNew =
        *status && (*status)->kind == FileKind::folder && (*status)->device == context_.device;
    if (!mayBeNew) continue;
    const auto row = context_.store.objectByInode((*status)->inode);
    if (!row) return fail(row.error());
    if (!*row || !watcher.isWatched((*row)->fileID)) return true;
  }
  return false;
}

Result<std::optional<ObjectStatus>> RecentNames::statusOf(const Name& name) const {
  const auto path = pathOf(context_, name.folder);
  if (!path) return fail(path.error());
  if (!*path) return std::nullopt;
  auto folder = context_.roots.openHolder(**path);
  const auto status = folder ? statusAt(folder->get(), name.name) : fail(folder.error());
  if (status) return *status;
  if (saysOutOfReach(status.error())) return std::nullopt;
  return fail(status.error());
}

}  // namespace mirabel
