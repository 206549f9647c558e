#include "linux/volume/RecentNames.h"

#include <fcntl.h>
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
      if (look.entryChanged && !name.empty()) unseen_.push_back({folder, name});
    }
  }
}

void RecentNames::clear() {
  unseen_.clear();
  byInode_.clear();
}

Result<std::vector<RecentPlace>> RecentNames::placesOf(std::uint64_t inode) {
  for (; !unseen_.empty(); unseen_.pop_back()) {
    if (auto looked = lookAt(unseen_.back()); !looked) return fail(looked.error());
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

Result<void> RecentNames::lookAt(const Name& name) {
  const auto path = pathOf(context_, name.folder);
  if (!path) return fail(path.error());
  if (!*path) return {};
  auto folder = context_.roots.open(**path, O_PATH | O_DIRECTORY);
  const auto status = folder ? statusAt(folder->get(), name.name) : fail(folder.error());
  if (!status) return saysOutOfReach(status.error()) ? Result<void>() : fail(status.error());
  byInode_.emplace(status->inode, name);
  return {};
}

}  // namespace mirabel
