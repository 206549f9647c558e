#include "linux/volume/ObjectFinder.h"

#include <set>
#include <utility>

#include "foundation/LookFailure.h"

namespace mirabel {

// Two roots may be copies of each other on two file systems, with equal numbers and times.
Result<bool> ObjectFinder::isObject(const ObjectRow& row, const Candidate& candidate,
                                    const PreciseLook& look) const {
  if (look.status.inode != row.inode) return false;
  auto fileSystem = fileSystemOf({candidate.folder, candidate.name, look.status}, device_);
  if (!fileSystem) return fail(fileSystem.error());
  return *fileSystem == row.fileSystem && compare(row, look) == Match::same;
}

Result<std::optional<ObjectFinder::Found>> ObjectFinder::lookAt(const ObjectRow& row,
                                                                const Candidate& candidate) const {
  const auto look = lookPrecisely(candidate.folder, candidate.name);
  const auto isIt = look ? isObject(row, candidate, *look) : fail(look.error());
  if (!isIt && saysOutOfReach(isIt.error())) return std::nullopt;
  if (!isIt) return fail(isIt.error());
  if (!*isIt) return std::nullopt;
  return Found{candidate.folderPath, candidate.name, look->status};
}

Result<std::optional<ObjectFinder::Found>> ObjectFinder::findAmong(
    const ObjectRow& row, const std::vector<RecentPlace>& places) const {
  for (const RecentPlace& place : places) {
    auto folder = roots_.openHolder(place.folderPath);
    if (!folder && saysOutOfReach(folder.error())) continue;
    if (!folder) return fail(folder.error());
    auto found = lookAt(row, {place.folderPath, folder->get(), place.name, row.inode});
    if (!found || *found) return found;
  }
  return std::nullopt;
}

Result<std::optional<ObjectFinder::Found>> ObjectFinder::find(const ObjectRow& row,
                                                              const std::string& folderPath,
                                                              const Others& others) {
  if (auto known = answers_.find(row.slot); known != answers_.end()) return known->second;

  if (recent_ != nullptr) {
    const auto places = recent_->placesOf(row.inode);
    if (!places) return fail(places.error());
    if (*places) {
      auto found = findAmong(row, **places);
      if (found) answers_[row.slot] = *found;
      return found;
    }
  }
  if (auto searched = search(row, folderPath, others); !searched) return fail(searched.error());
  return answers_.at(row.slot);
}

Result<void> ObjectFinder::search(const ObjectRow& row, const std::string& folderPath,
                                  const Others& others) {
  std::map<std::uint64_t, ObjectRow> lost{{row.inode, row}};
  std::set<std::uint64_t> wanted{row.inode};
  const auto visitor = [&](const Candidate& candidate) -> Result<bool> {
    const ObjectRow& sought = lost.at(candidate.inode);
    auto found = lookAt(sought, candidate);
    if (!found) return fail(found.error());
    if (!*found) return false;
    answers_[sought.slot] = std::move(*found);
    return true;
  };
  if (auto done = searchFolder(roots_, folderPath, wanted, visitor); !done) return done;
  if (!wanted.empty()) {
    for (ObjectRow& other : others()) {
      if (answers_.contains(other.slot) || lost.contains(other.inode)) continue;
      wanted.insert(other.inode);
      lost.emplace(other.inode, std::move(other));
    }
    if (auto done = searchRoots(roots_, wanted, visitor); !done) return done;
  }
  for (const std::uint64_t inode : wanted)
    answers_[lost.at(inode).slot] = std::nullopt;
  return {};
}

}  // namespace mirabel
