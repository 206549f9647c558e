#include "linux/volume/RecentNames.h"

#include <fcntl.h>
#include <utility>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

std::optional<std::string> pathOf(const IndexContext& context, std::uint64_t folder) {
  auto row = context.store.objectByFileID(folder);
  if (!row || !*row || !(*row)->location) return std::nullopt;
  auto path = context.paths.pathOf(*(*row)->location);
  if (!path) return std::nullopt;
  return std::move(*path);
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

std::vector<RecentPlace> RecentNames::placesOf(std::uint64_t inode) {
  for (const Name& name : std::exchange(unseen_, {}))
    lookAt(name);
  std::vector<RecentPlace> places;
  const auto [begin, end] = byInode_.equal_range(inode);
  for (auto found = begin; found != end; ++found) {
    if (auto path = pathOf(context_, found->second.folder)) {
      places.push_back({std::move(*path), found->second.name});
    }
  }
  return places;
}

void RecentNames::lookAt(const Name& name) {
  const auto path = pathOf(context_, name.folder);
  if (!path) return;
  auto folder = context_.roots.open(*path, O_PATH | O_DIRECTORY);
  if (!folder) return;
  const auto status = statusAt(folder->get(), name.name);
  if (status) byInode_.emplace(status->inode, name);
}

}  // namespace mirabel
