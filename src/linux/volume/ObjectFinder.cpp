#include "linux/volume/ObjectFinder.h"

#include <fcntl.h>
#include <set>
#include <utility>

namespace mirabel {

// Two roots may be copies of each other on two file systems, with equal numbers and times.
bool ObjectFinder::isObject(const ObjectRow& row, const Candidate& candidate,
                            const PreciseLook& look) const {
  return look.status.inode == row.inode &&
         fileSystemOf({candidate.folder, candidate.name, look.status}, device_) == row.fileSystem &&
         compare(row, look) == Match::same;
}

std::optional<ObjectFinder::Found> ObjectFinder::findAmong(
    const ObjectRow& row, const std::vector<RecentPlace>& places) const {
  for (const RecentPlace& place : places) {
    auto folder = roots_.open(place.folderPath, O_PATH | O_DIRECTORY);
    if (!folder) continue;
    const auto look = lookPrecisely(folder->get(), place.name);
    if (look && isObject(row, {place.folderPath, folder->get(), place.name, row.inode}, *look)) {
      return Found{place.folderPath, place.name, look->status};
    }
  }
  return std::nullopt;
}

std::optional<ObjectFinder::Found> ObjectFinder::find(const ObjectRow& row,
                                                      const std::string& folderPath,
                                                      const Others& others) {
  if (auto known = answers_.find(row.slot); known != answers_.end()) return known->second;

  if (recent_ != nullptr) {
    if (const auto places = recent_->placesOf(row.inode)) {
      return answers_[row.slot] = findAmong(row, *places);
    }
  }
  std::map<std::uint64_t, ObjectRow> lost{{row.inode, row}};
  std::set<std::uint64_t> wanted{row.inode};
  const auto visitor = [&](const Candidate& candidate) {
    const ObjectRow& sought = lost.at(candidate.inode);
    const auto look = lookPrecisely(candidate.folder, candidate.name);
    if (!look || !isObject(sought, candidate, *look)) return false;
    answers_[sought.slot] = Found{candidate.folderPath, candidate.name, look->status};
    return true;
  };
  searchFolder(roots_, folderPath, wanted, visitor);
  if (!wanted.empty()) {
    for (ObjectRow& other : others()) {
      if (answers_.contains(other.slot) || lost.contains(other.inode)) continue;
      wanted.insert(other.inode);
      lost.emplace(other.inode, std::move(other));
    }
    searchRoots(roots_, wanted, visitor);
  }
  for (const std::uint64_t inode : wanted)
    answers_[lost.at(inode).slot] = std::nullopt;
  return answers_.at(row.slot);
}

}  // namespace mirabel
