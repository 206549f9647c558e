#include "linux/volume/PlaceLooks.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/kernel/ClosedFolders.h"
#include "linux/volume/DiskEntry.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {
namespace {

bool hasEntryChange(const LookList::Names& names) {
  return std::ranges::any_of(names, [](const auto& name) { return name.second.entryChanged; });
}

}  // namespace

Result<LookList::Folders> PlaceLooks::look(const Transaction& transaction, const Pause& pause,
                                           FolderWatcher& watcher, LookList::Folders folders) {
  LookList::Folders later;
  std::size_t sincePause = 0;
  auto next = folders.begin();
  while (next != folders.end()) {
    auto done = transaction([&]() -> Result<void> {
      for (std::size_t looked = 0; next != folders.end() && looked < entriesPerTransaction;) {
        auto& [id, names] = *next;
        auto presence = lookInFolder(watcher, id, names);
        if (!presence) return fail(presence.error());
        looked += names.size();
        sincePause += names.size();
        if (*presence == Presence::gone) watcher.forget(id);
        if (*presence == Presence::moved) later[id] = std::move(names);
        ++next;
        if (sincePause < entriesPerPause) continue;
        sincePause = 0;
        if (auto paused = pause(); !paused) return paused;
      }
      return {};
    });
    if (!done) return fail(done.error());
  }
  return later;
}

Result<PlaceLooks::Presence> PlaceLooks::open(std::uint64_t id, Folder& folder) const {
  auto row = context_.store.objectByFileID(id);
  if (!row) return fail(row.error());
  // The folder has left, or went with one above it: whoever finds it again reads all of it.
  if (!*row || !(*row)->location) return Presence::gone;
  auto path = context_.paths.pathOfFolder(**row);
  if (!path) return fail(path.error());
  if (!*path) return Presence::gone;
  folder.row = std::move(**row);
  folder.path = std::move(**path);
  auto opened = context_.roots.open(folder.path, O_PATH | O_DIRECTORY);
  // Whoever closed a folder above has left a record of that; it may be open again by then, so that
  // this one must not be forgotten.
  if (!opened && saysOutOfReach(opened.error())) return Presence::moved;
  if (!opened) return fail(opened.error());
  auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  const bool isIt = status->inode == folder.row.inode && status->device == context_.device &&
                    compare(folder.row, {opened->get(), "", *status}) == Match::same;
  folder.descriptor = std::move(*opened);
  return isIt ? Presence::here : Presence::moved;
}

Result<PlaceLooks::Presence> PlaceLooks::lookInFolder(FolderWatcher& watcher, std::uint64_t id,
                                                      const Names& names) {
  Folder folder;
  auto presence = open(id, folder);
  if (!presence || *presence == Presence::moved) return presence;
  const bool isOpen = *presence == Presence::here && !isClosed(folder.descriptor.get());
  if (!isOpen) {
    // What was linked in it or written to, and left with it, may live on elsewhere.
    for (const auto& [name, look] : names) {
      if (auto done = noteOthers(look, nullptr); !done) return fail(done.error());
    }
  }
  if (*presence == Presence::gone) return presence;
  if (isOpen) {
    presence = lookAtNames(watcher, folder, names);
    if (!presence || *presence != Presence::here) return presence;
  }
  const auto itself = names.find("");
  const bool attributesChanged = itself != names.end() && itself->second.contentChanged;
  if (itself == names.end() && !hasEntryChange(names)) return Presence::here;
  if (auto done = lookAtItself(folder, attributesChanged); !done) return fail(done.error());
  return Presence::here;
}

Result<PlaceLooks::Presence> PlaceLooks::lookAtNames(FolderWatcher& watcher, const Folder& folder,
                                                     const Names& names) {
  const std::uint64_t id = folder.row.fileID;
  auto seen = sightings(folder, names);
  if (!seen) return fail(seen.error());
  auto learned = context_.learner.learn(folder.path, folder.descriptor.get(), id, *seen);
  if (!learned && isDisturbance(learned.error())) return Presence::moved;
  if (!learned) return fail(learned.error());
  for (const Sighting& sighting : *seen) {
    if (sighting.fileID == 0) {
      if (auto noted = missing_.add(id, sighting.name); !noted) return fail(noted.error());
      continue;
    }
    if (sighting.status.kind == FileKind::folder) followFolder(watcher, folder, sighting);
  }
  return Presence::here;
}

Result<std::vector<Sighting>> PlaceLooks::sightings(const Folder& folder, const Names& names) {
  std::vector<Sighting> seen;
  for (const auto& [name, look] : names) {
    if (name.empty()) continue;
    auto status = statusAt(folder.descriptor.get(), name);
    if (!status && !saysOutOfReach(status.error())) return fail(status.error());
    if (!look.unlinked.empty()) {
      auto ended = endUnlinked(folder, name, look, status ? &*status : nullptr);
      if (!ended) return fail(ended.error());
    }
    if (auto done = noteOthers(look, status ? &*status : nullptr); !done) {
      return fail(done.error());
    }
    if (!status) {
      if (auto noted = missing_.add(folder.row.fileID, name); !noted) return fail(noted.error());
      continue;
    }
    Sighting sighting{name, *status};
    sighting.isPackage = status->kind == FileKind::folder && context_.isPackageName(name);
    sighting.isReported = look.contentChanged;
    seen.push_back(std::move(sighting));
  }
  return seen;
}

// What was unlinked under a name that has another object now was not saved over: it has ended, and
// the other is a thing of its own.
Result<void> PlaceLooks::endUnlinked(const Folder& folder, const std::string& name,
                                     const Look& look, const ObjectStatus* status) {
  if (status == nullptr) return {};  // a missing name like any other
  auto occupant = context_.store.objectAt(folder.row.fileID, name);
  if (!occupant) return fail(occupant.error());
  if (!*occupant) return {};
  // Its number alone proves nothing: a file system may give it to the next file at once.
  const SeenObject seen{folder.descriptor.get(), name, *status};
  if ((*occupant)->inode == status->inode && compare(**occupant, seen) == Match::same) return {};
  const bool wasIt = std::ranges::any_of(look.unlinked, [&](const std::string& handle) {
    return handle == "?" || (!handle.empty() && handle == (*occupant)->handle);
  });
  return wasIt ? context_.learner.leave(std::move(**occupant)) : Result<void>();
}

// What was linked or written to under a name that does not stand for it any more may have other
// names, which the index need not have known together with this one: the count of its links has
// changed there, or what is in it.
Result<void> PlaceLooks::noteOthers(const Look& look, const ObjectStatus* status) {
  for (const std::string& handle : look.objects) {
    const std::vector<std::uint64_t> inodes = inodesIn(handle);
    if (status != nullptr && std::ranges::find(inodes, status->inode) != inodes.end()) continue;
    for (const std::uint64_t inode : inodes) {
      auto row = context_.store.objectByInode(inode);
      if (!row) return fail(row.error());
      if (*row && (*row)->handle == handle) others_.insert((*row)->fileID);
    }
  }
  return {};
}

Result<void> PlaceLooks::lookAtOthers() {
  for (const std::uint64_t id : std::exchange(others_, {})) {
    auto row = context_.store.objectByFileID(id);
    if (!row) return fail(row.error());
    if (!*row || !(*row)->location) continue;
    auto isThere = lookAtObject(**row);
    if (!isThere) return fail(isThere.error());
    if (!*isThere) others_.insert(id);
  }
  return {};
}

Result<bool> PlaceLooks::lookAtObject(const ObjectRow& row) {
  auto path = context_.paths.pathOf(*row.location);
  if (!path) return fail(path.error());
  if (!*path) return true;
  if (row.location->folder == 0) return lookAtRoot(**path);
  const auto look = lookAt(context_.roots, **path);
  if (!look && !saysOutOfReach(look.error())) return fail(look.error());
  if (!look || look->seen.status.inode != row.inode) return false;
  const bool isPackage = context_.isPackageName(row.location->name);
  auto learned = context_.learner.learnPath(**path, look->seen.status, isPackage, true);
  if (!learned && !isDisturbance(learned.error())) return fail(learned.error());
  return learned.has_value();
}

/// The document storage is no item; the other roots are.
Result<bool> PlaceLooks::lookAtRoot(const std::string& path) {
  if (path == context_.roots.firstPath()) return true;
  auto id = context_.learner.rootID(path, true);
  // What has become of a root that is not there is found when roots are looked at.
  if (!id && !saysOutOfReach(id.error())) return fail(id.error());
  return true;
}

// Its count and its dates are those of a new state as well. A change of its mode may have made it
// readable, or unreadable.
Result<void> PlaceLooks::lookAtItself(const Folder& folder, bool attributesChanged) {
  if (attributesChanged) scan_.add(folder.path, folder.row.fileID, TreeScan::Depth::folder);
  // Whoever has moved it since has left a record of that.
  if (auto looked = lookAtObject(folder.row); !looked) return fail(looked.error());
  return {};
}

void PlaceLooks::followFolder(const FolderWatcher& watcher, const Folder& folder,
                              const Sighting& sighting) {
  if (sighting.status.device != context_.device) return;
  const bool isFollowed = watcher.isWatched(sighting.fileID);
  if (isFollowed && !sighting.isReported) return;
  scan_.add(folder.path + "/" + sighting.name, sighting.fileID,
            isFollowed ? TreeScan::Depth::folder : TreeScan::Depth::everything);
}

}  // namespace mirabel
