#include "linux/volume/Learner.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <set>
#include <utility>
#include <vector>

#include "foundation/LookFailure.h"
#include "foundation/SplitWork.h"
#include "linux/volume/DiskEntry.h"

namespace mirabel {

bool isDisturbance(const Error& error) {
  return error.isPosix(ESTALE) || saysOutOfReach(error);
}

Learner::Learner(IdentityStore& store, IdentifierAllocator& allocator, ChangeRecorder& recorder,
                 const MonitoredRoots& roots, std::uint64_t device, PackageNames isPackageName)
    : store_(store),
      recorder_(recorder),
      roots_(roots),
      device_(device),
      isPackageName_(std::move(isPackageName)),
      paths_(store, roots, device),
      finder_(roots, device),
      placer_(store, allocator, recorder, finder_, roots, paths_, *this, device, isPackageName_) {
  placer_.setOthers([] { return std::vector<ObjectRow>(); });
}

// Folders ---------------------------------------------------------------------------------------

Result<std::uint64_t> Learner::rootID(const std::string& path, bool isReported) {
  const auto folder = roots_.open(path, O_PATH | O_DIRECTORY);
  if (!folder) return fail(folder.error());
  auto status = statusAt(folder->get(), "");
  if (!status) return fail(status.error());
  Arrival arrival{{folder->get(), "", *status}, path, {0, path}, objectKind(status->kind, false)};
  arrival.isReported = isReported;
  auto row = placer_.place(std::move(arrival));
  if (!row) return fail(row.error());
  return row->fileID;
}

Result<std::uint64_t> Learner::folderID(const std::string& path, int folder) {
  auto status = statusAt(folder, "");
  if (!status) return fail(status.error());
  return folderID(path, folder, *status);
}

Result<std::uint64_t> Learner::folderID(const std::string& path, int folder,
                                        const ObjectStatus& status) {
  SeenObject seen{folder, "", status};
  auto slot = placer_.slotOf(seen);
  if (!slot) return fail(slot.error());
  if (slot->row && slot->row->location && compare(*slot->row, seen) == Match::same) {
    auto known = paths_.pathOfFolder(*slot->row);
    if (!known) return fail(known.error());
    if (*known == path) return slot->row->fileID;
  }
  const auto place = roots_.locate(path);
  if (!place) {
    auto learned = learnPath(path, status, false);
    if (!learned) return fail(learned.error());
    return learned->fileID;
  }
  // Not known to lie there: learn the way to it from the top.
  auto id = rootID(std::string(place->rootPath));
  std::size_t end = place->rootPath.size();
  while (id && end < path.size()) {
    const std::size_t start = end + 1;
    end = std::min(path.find('/', start), path.size());
    auto look = lookAt(roots_, path.substr(0, end));
    if (!look) return fail(look.error());
    const std::string name = path.substr(start, end - start);
    const ObjectKind kind = objectKind(look->seen.status.kind, isPackageName_(name));
    auto row = placer_.place({look->seen, path.substr(0, start - 1), {*id, name}, kind});
    if (!row) return fail(row.error());
    id = row->fileID;
    // Another folder has come to the path since `folder` was opened by it.
    const bool isLast = end == path.size();
    if (isLast && look->seen.status.inode != status.inode) return fail(Error::posix(ESTALE));
  }
  return id;
}

// Names seen ------------------------------------------------------------------------------------

Result<std::uint64_t> Learner::learn(const std::string& folderPath, int folder,
                                     std::span<Sighting> sightings) {
  finder_.forget();
  auto id = folderID(folderPath, folder);
  if (!id) return fail(id.error());
  if (auto learned = learnIn({folderPath, folder, *id}, sightings); !learned) {
    return fail(learned.error());
  }
  return *id;
}

Result<std::uint64_t> Learner::learn(const std::string& folderPath, int folder,
                                     std::uint64_t knownID, std::span<Sighting> sightings) {
  // What was learned meanwhile may have taken the folder elsewhere.
  const std::string* path = store_.folderPaths().find(knownID);
  if (path == nullptr || *path != folderPath) return learn(folderPath, folder, sightings);
  finder_.forget();
  if (auto learned = learnIn({folderPath, folder, knownID}, sightings); !learned) {
    return fail(learned.error());
  }
  return knownID;
}

Result<void> Learner::learnIn(const Folder& folder, std::span<Sighting> sightings) {
  static_cast<void>(placer_.takenDocuments());
  // First what nothing has happened to, which is nearly all, then the rest.
  std::vector<Unsettled> rest;
  for (std::size_t i = 0; i < sightings.size(); ++i) {
    auto knowledge = recognise(folder.id, sightings[i]);
    if (!knowledge) {
      store_.endComparing();
      return fail(knowledge.error());
    }
    if (*knowledge != Knowledge::unchanged) {
      rest.push_back({i, *knowledge == Knowledge::none && isOnVolume(sightings[i]), ""});
    }
  }
  store_.endComparing();
  if (rest.empty()) return {};
  readHandles(folder.descriptor, sightings, rest);
  auto hasNames = store_.hasNames(folder.id);
  if (!hasNames) return fail(hasNames.error());
  Newcomers newcomers(*hasNames);
  for (Unsettled& entry : rest) {
    placer_.setOthers([&] {
      return occupants(folder.id, sightings.subspan(entry.index))
          .value_or(std::vector<ObjectRow>());
    });
    Sighting& sighting = sightings[entry.index];
    auto placed = placeEntry(folder, sighting, std::move(entry), newcomers);
    placer_.setOthers([] { return std::vector<ObjectRow>(); });
    if (!placed) return placed;
  }
  return correctDocuments(sightings);
}

// A document that was answered for a backup may have gone to a name that came later.
Result<void> Learner::correctDocuments(std::span<Sighting> sightings) {
  const std::set<std::uint32_t> taken = placer_.takenDocuments();
  if (taken.empty()) return {};
  for (Sighting& sighting : sightings) {
    if (!taken.contains(sighting.documentID)) continue;
    auto row = store_.objectByFileID(sighting.fileID);
    if (!row) return fail(row.error());
    if (*row) sighting.documentID = (*row)->documentID;
  }
  return {};
}

bool Learner::isOnVolume(const Sighting& sighting) const {
  return sighting.status.device == device_;
}

Result<Knowledge> Learner::recognise(std::uint64_t folder, Sighting& sighting) {
  if (!isOnVolume(sighting)) return Knowledge::none;
  const ObjectStatus& status = sighting.status;
  const ObjectKind kind = objectKind(status.kind, sighting.isPackage);
  auto known = store_.compareEntry(status.inode, folder, sighting.name, kind, status.birthTime,
                                   status.changeTime);
  if (!known) return fail(known.error());
  if (known->knowledge != Knowledge::unchanged) return known->knowledge;
  if (isDocumentKind(kind) && known->documentID == 0) return Knowledge::different;
  sighting.fileID = known->fileID;
  sighting.documentID = isDocumentKind(kind) ? known->documentID : 0;
  return Knowledge::unchanged;
}

void Learner::readHandles(int folder, std::span<const Sighting> sightings,
                          std::vector<Unsettled>& entries) {
  constexpr std::size_t piece = 64;
  splitWork(entries.size(), piece, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      if (!entries[i].isNew) continue;
      const Sighting& sighting = sightings[entries[i].index];
      entries[i].handle = handleAt(folder, sighting.name).value_or("");
      // The handle must be that of the object whose status was read a while ago.
      const auto now = statusAt(folder, sighting.name);
      entries[i].isNew =
          now && now->inode == sighting.status.inode && now->birthTime == sighting.status.birthTime;
    }
  });
}

Result<void> Learner::placeEntry(const Folder& folder, Sighting& sighting, Unsettled entry,
                                 Newcomers& newcomers) {
  if (!entry.isNew) {
    // Since it was seen, others may have looked later and told the index more: what is placed now
    // must be what is there now.
    auto status = statusAt(folder.descriptor, sighting.name);
    if (!status) return saysOutOfReach(status.error()) ? Result<void>() : fail(status.error());
    sighting.status = *status;
    sighting.isPackage = status->kind == FileKind::folder && isPackageName_(sighting.name);
  }
  Arrival arrival{{folder.descriptor, sighting.name, sighting.status},
                  folder.path,
                  {folder.id, sighting.name},
                  objectKind(sighting.status.kind, sighting.isPackage)};
  arrival.isReported = sighting.isReported;
  // Several links are several arrivals of one object.
  const bool mayBeNew = entry.isNew && sighting.status.linkCount == 1;
  auto isNew = mayBeNew ? isNewcomer(folder, sighting, newcomers) : false;
  if (!isNew) return fail(isNew.error());
  if (*isNew) {
    arrival.isOccupied = false;
    arrival.newHandle = std::move(entry.handle);
    newcomers.add(sighting.name, sighting.status.inode);
  } else {
    newcomers.addOther();
  }
  auto row = placer_.place(std::move(arrival));
  if (!row && row.error().isPosix(ESTALE)) return {};
  if (!row) return fail(row.error());
  sighting.fileID = row->fileID;
  sighting.documentID = isDocumentKind(row->kind) ? row->documentID : 0;
  return {};
}

/// Whether neither its name nor its inode number is in the index.
Result<bool> Learner::isNewcomer(const Folder& folder, const Sighting& sighting,
                                 const Newcomers& newcomers) {
  if (!newcomers.isFree(sighting.name)) {
    auto occupied = store_.isOccupied(folder.id, sighting.name);
    if (!occupied || *occupied) return occupied ? Result<bool>(false) : occupied;
  }
  if (newcomers.isStillNew(sighting.status.inode)) return true;
  auto row = store_.objectByInode(sighting.status.inode);
  if (!row) return fail(row.error());
  return !*row;
}

Result<std::vector<ObjectRow>> Learner::occupants(std::uint64_t folder,
                                                  std::span<const Sighting> sightings) {
  std::vector<ObjectRow> result;
  for (const Sighting& sighting : sightings) {
    auto occupant = store_.objectAt(folder, sighting.name);
    if (!occupant) return fail(occupant.error());
    if (*occupant && (*occupant)->documentID != 0 && (*occupant)->inode != sighting.status.inode) {
      result.push_back(std::move(**occupant));
    }
  }
  return result;
}

Result<Sighting> Learner::learnPath(const std::string& path, const ObjectStatus& status,
                                    bool isPackage, bool isReported) {
  const auto place = roots_.locate(path);
  if (!place || place->relative.empty()) return learnWhole(path, isPackage);
  const SplitPath split = splitPath(path);
  Sighting sighting{split.name, status, isPackage};
  sighting.isReported = isReported;
  // A name that changed hands while it was looked at is looked at again.
  constexpr int mostLooks = 8;
  for (int look = 0; look < mostLooks; ++look) {
    auto entry = lookAt(roots_, path);
    if (!entry) return fail(entry.error());
    auto learned = learn(split.parent, entry->folder.get(), {&sighting, 1});
    if (!learned) return fail(learned.error());
    if (sighting.fileID != 0) return sighting;
  }
  return fail(Error::posix(ESTALE));
}

Result<Sighting> Learner::learnWhole(const std::string& path, bool isPackage) {
  auto look = lookAt(roots_, path);
  if (!look) return fail(look.error());
  finder_.forget();
  const ObjectStatus& status = look->seen.status;
  auto row = objectInPlace(look->seen);
  if (row && !*row) {
    row = placer_.place(
        {look->seen, splitPath(path).parent, {0, path}, objectKind(status.kind, isPackage)});
  }
  if (!row) return fail(row.error());
  return Sighting{path, status, isPackage, (*row)->fileID,
                  isDocumentKind((*row)->kind) ? (*row)->documentID : 0};
}

Result<std::optional<ObjectRow>> Learner::objectInPlace(const SeenObject& seen) {
  auto slot = placer_.slotOf(seen);
  if (!slot) return fail(slot.error());
  const std::optional<ObjectRow>& row = slot->row;
  if (!row || !row->location || compare(*row, seen) != Match::same) return std::nullopt;
  auto standing = paths_.standingPath(*row, *row->location);
  if (!standing) return fail(standing.error());
  return *standing ? row : std::nullopt;
}

Result<void> Learner::leave(ObjectRow row) {
  const Location from = *row.location;
  auto promoted = placer_.promoteLink(row);
  if (!promoted) return fail(promoted.error());
  if (*promoted) recorder_.noteSurvivor(row.fileID);
  if (*promoted) return {};
  row.location.reset();
  if (auto told = recorder_.gone(row, from); !told) return told;
  return store_.put(row);
}

Result<void> Learner::leaveOutside(const std::string& path) {
  const auto isMeant = [&](const std::string& name) {
    return name == path || name.starts_with(path + "/");
  };
  auto links = store_.linksIn(0);
  if (!links) return fail(links.error());
  for (const auto& [name, slot] : *links) {
    if (!isMeant(name)) continue;
    if (auto removed = store_.removeLink(0, name); !removed) return removed;
  }
  auto outside = store_.childrenOf(0);
  if (!outside) return fail(outside.error());
  for (ObjectRow& row : *outside) {
    if (!isMeant(row.location->name)) continue;
    if (auto left = leave(std::move(row)); !left) return left;
  }
  return {};
}

}  // namespace mirabel
