#include "linux/volume/Placer.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/vfs.h>
#include <utility>

#include "linux/kernel/LongPath.h"
#include "linux/volume/DiskEntry.h"

namespace mirabel {
namespace {

// Moves that uncover moves. Each detaches a row first, so this is only reached when names change
// faster than they are read.
constexpr int deepestChain = 64;

// The kernel's own ID of the file system mounted at an entry, which outlasts device numbers.
std::uint64_t fileSystemID(const SeenObject& seen) {
  UniqueFd object(::openat(seen.directory, seen.name.empty() ? "." : seen.name.c_str(),
                           O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct statfs info;
  std::uint64_t id = 0;
  if (object && ::fstatfs(object.get(), &info) == 0) {
    static_assert(sizeof(info.f_fsid) == sizeof(id));
    std::memcpy(&id, &info.f_fsid, sizeof(id));
  }
  return id != 0 ? id : seen.status.device;
}

class Deeper {
 public:
  explicit Deeper(int& depth) : depth_(depth) { ++depth_; }
  ~Deeper() { --depth_; }
  Deeper(const Deeper&) = delete;
  Deeper& operator=(const Deeper&) = delete;

 private:
  int& depth_;
};

}  // namespace

Placer::Placer(IdentityStore& store, IdentifierAllocator& allocator, ChangeRecorder& recorder,
               ObjectFinder& finder, const MonitoredRoots& roots, FolderIdentities& folders,
               std::uint64_t device, std::function<bool(std::string_view)> isPackageName)
    : store_(store),
      allocator_(allocator),
      recorder_(recorder),
      finder_(finder),
      roots_(roots),
      folders_(folders),
      device_(device),
      isPackageName_(std::move(isPackageName)) {}

Result<Slot> Placer::slotOf(const SeenObject& seen) {
  Slot slot;
  if (seen.status.device == device_) {
    auto row = store_.objectByInode(seen.status.inode);
    if (!row) return fail(row.error());
    slot.row = std::move(*row);
    return slot;
  }
  slot.fileSystem = fileSystemID(seen);
  auto row = store_.foreignObject(slot.fileSystem, seen.status.inode);
  if (!row) return fail(row.error());
  slot.row = std::move(*row);
  return slot;
}

Result<ObjectRow> Placer::place(Arrival arrival) {
  if (arrival.newHandle) return placeNew(arrival, Slot{}, std::move(*arrival.newHandle));
  auto slot = slotOf(arrival.seen);
  if (!slot) return fail(slot.error());
  if (slot->row && compare(*slot->row, arrival.seen) == Match::same) {
    return placeKnown(arrival, std::move(*slot->row));
  }
  if (!slot->row) {
    std::string handle = handleAt(arrival.seen.directory, arrival.seen.name).value_or("");
    return placeNew(arrival, *slot, std::move(handle));
  }
  // It looks like a new object with a used number. Status and handle were read one after the
  // other, so the name may have changed hands in between: look again at one object for sure.
  const auto look = lookPrecisely(arrival.seen.directory, arrival.seen.name);
  if (!look) return fail(Error::posix(ESTALE));
  arrival.seen.status = look->status;
  arrival.kind = objectKind(look->status.kind, isPackageName_(arrival.location.name));
  slot = slotOf(arrival.seen);
  if (!slot) return fail(slot.error());
  if (slot->row && compare(*slot->row, *look) == Match::same) {
    return placeKnown(arrival, std::move(*slot->row));
  }
  return placeNew(arrival, *slot, look->handle);
}

// Known objects ---------------------------------------------------------------------------------

Result<ObjectRow> Placer::placeKnown(const Arrival& arrival, ObjectRow row) {
  const bool changedKind = row.kind != arrival.kind;
  const bool changed = changedKind || row.changeTime != arrival.seen.status.changeTime;
  const bool stale = changed || isStale(row, arrival.seen.status);
  row.kind = arrival.kind;
  refresh(row, arrival.seen.status);
  const std::uint32_t before = row.documentID;
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  if (row.location == arrival.location) {
    if (!stale && row.documentID == before) return row;
    auto written = put(std::move(row));
    if (!written || !changed) return written;
    auto told = tellChange(*written, arrival.location, changedKind);
    if (!told) return fail(told.error());
    return written;
  }
  auto further = isFurtherLink(arrival, row);
  if (!further) return fail(further.error());
  if (!*further) return moveTo(arrival, std::move(row), changedKind);
  auto written = put(std::move(row));
  if (!written) return written;
  auto told = tellChange(*written, arrival.location, changedKind);
  if (!told) return fail(told.error());
  return written;
}

// An object that changed is told under each of its names.
Result<void> Placer::tellChange(const ObjectRow& row, const Location& location, bool changedKind) {
  if (!recorder_.isActive()) return {};
  if (auto told = recorder_.changed(row, location, changedKind); !told) return told;
  if (row.location && !(*row.location == location)) {
    if (auto told = recorder_.changed(row, *row.location, changedKind); !told) return told;
  }
  auto names = store_.links(row.slot);
  if (!names) return fail(names.error());
  for (const Location& name : *names) {
    if (name == location) continue;
    if (auto told = recorder_.changed(row, name, changedKind); !told) return told;
  }
  return changedKind ? recorder_.contents(row.fileID) : Result<void>();
}

Result<bool> Placer::isFurtherLink(const Arrival& arrival, const ObjectRow& row) {
  if (arrival.seen.status.linkCount < 2 || arrival.seen.status.kind == FileKind::folder) {
    return false;
  }
  auto link = store_.linkAt(arrival.location.folder, arrival.location.name);
  if (!link) return fail(link.error());
  if (*link == row.slot) return true;
  if (!row.location) return false;
  auto still = isStillAt(row, *row.location);
  if (!still || !*still) return still;
  // Linking over a document ends it: the object that arrives is shown under its other names too,
  // and keeps the identity that it has there.
  auto vacated = vacate(arrival, row.slot);
  if (!vacated) return fail(vacated.error());
  if (*vacated) {
    if (auto told = recorder_.handedOn(**vacated, 0, 0); !told) return fail(told.error());
  }
  if (auto added = store_.addLink(arrival.location, row.slot); !added) return fail(added.error());
  return true;
}

Result<bool> Placer::isStillAt(const ObjectRow& row, const Location& location) {
  auto path = store_.pathOf(location);
  if (!path) return fail(path.error());
  if (!*path) return false;
  const auto look = lookAt(roots_, **path);
  return look && look->seen.status.inode == row.inode && compare(row, look->seen) == Match::same;
}

Result<ObjectRow> Placer::moveTo(const Arrival& arrival, ObjectRow row, bool changedKind) {
  const std::optional<Location> from = std::exchange(row.location, std::nullopt);
  // Off its old name first: what is found to lie there now can then be put there.
  if (auto detached = store_.put(row); !detached) return fail(detached.error());
  if (arrival.seen.status.linkCount < 2) {
    if (auto dropped = dropLinks(row.slot); !dropped) return fail(dropped.error());
  }
  auto inherited = vacate(arrival, row.slot);
  if (inherited && !*inherited) inherited = takeHandover(arrival, row.documentID);
  if (!inherited) return fail(inherited.error());
  // Making room may have touched this row too.
  auto current = store_.objectInSlot(row.slot);
  if (!current) return fail(current.error());
  if (*current) row.documentID = (*current)->documentID;
  if (*inherited) {
    // Its own document ends here: the name's goes on.
    const std::uint32_t own = std::exchange(row.documentID, **inherited);
    if (auto ended = store_.removeHandovers(own); !ended) return fail(ended.error());
    if (own != 0) {
      if (auto told = recorder_.handedOn(own, row.fileID, 0); !told) return fail(told.error());
    }
    if (auto told = recorder_.handedOn(row.documentID, 0, row.fileID); !told) {
      return fail(told.error());
    }
  }
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  row.location = arrival.location;
  if (row.documentID != 0) {
    if (auto ended = store_.removeHandovers(row.documentID); !ended) return fail(ended.error());
    if (from && from->folder == arrival.location.folder &&
        isBackupName(arrival.location.name, from->name)) {
      auto noted = store_.addHandover(*from, row.documentID);
      if (!noted) return fail(noted.error());
    }
  }
  auto written = put(std::move(row));
  if (!written) return written;
  if (auto told = recorder_.moved(*written, from, arrival.location, changedKind); !told) {
    return fail(told.error());
  }
  if (changedKind) {
    auto told = tellChange(*written, arrival.location, true);
    if (!told) return fail(told.error());
  }
  return written;
}

Result<ObjectRow> Placer::placeFound(ObjectRow row, const ObjectFinder::Found& found) {
  auto folder = roots_.open(found.folderPath, O_PATH | O_DIRECTORY);
  if (!folder) return row;
  auto id = folders_.folderID(found.folderPath, folder->get());
  if (!id) return fail(id.error());
  // Learning the way there may have moved the row itself.
  auto current = store_.objectInSlot(row.slot);
  if (!current) return fail(current.error());
  if (*current) row = std::move(**current);
  Arrival arrival{{folder->get(), found.name, found.status},
                  found.folderPath,
                  {*id, found.name},
                  objectKind(found.status.kind, isPackageName_(found.name))};
  return placeKnown(arrival, std::move(row));
}

// New objects -----------------------------------------------------------------------------------

Result<ObjectRow> Placer::placeNew(const Arrival& arrival, const Slot& slot, std::string handle) {
  std::optional<std::uint32_t> document;
  if (slot.row) {
    // The number's former holder is gone. Where it had this very name, this is its save.
    ObjectRow former = *slot.row;
    const bool isSave = former.location == arrival.location && former.kind == arrival.kind;
    if (isSave && former.documentID != 0) document = std::exchange(former.documentID, 0);
    if (former.location) {
      if (auto told = recorder_.gone(former, *former.location); !told) return fail(told.error());
    }
    if (auto dropped = dropLinks(slot.row->slot); !dropped) return fail(dropped.error());
    if (auto removed = store_.remove(slot.row->slot); !removed) return fail(removed.error());
  }
  if (!document) {
    auto inherited = vacate(arrival, 0);
    if (inherited && !*inherited) inherited = takeHandover(arrival, 0);
    if (!inherited) return fail(inherited.error());
    document = *inherited;
    // What made room may have been found inside the very folder that arrives, which is known then.
    auto now = slotOf(arrival.seen);
    if (!now) return fail(now.error());
    if (now->row && compare(*now->row, arrival.seen) == Match::same) {
      return adopt(arrival, std::move(*now->row), document);
    }
  }
  ObjectRow row;
  row.kind = arrival.kind;
  row.location = arrival.location;
  row.inode = arrival.seen.status.inode;
  row.fileSystem = slot.fileSystem;
  row.handle = std::move(handle);
  refresh(row, arrival.seen.status);
  const bool ownNumber = slot.fileSystem == 0 && row.inode < upperFileIDs;
  if (ownNumber && !slot.row && !allocator_.inodeNumbersAreSpent()) {
    row.fileID = row.inode;
  } else {
    auto next = allocator_.nextFileID();
    if (!next) return fail(next.error());
    row.fileID = *next;
  }
  row.documentID = document.value_or(0);
  if (document) {
    if (auto ended = store_.removeHandovers(*document); !ended) return fail(ended.error());
  }
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  const bool isOwnDocument = !document && row.documentID != 0;
  row.slot = isOwnDocument ? row.documentID : allocator_.nextUpperSlot();
  if (auto inserted = store_.insert(row); !inserted) return fail(inserted.error());
  if (document) {
    auto told = recorder_.handedOn(*document, 0, row.fileID);
    if (!told) return fail(told.error());
  }
  if (auto told = recorder_.changed(row, arrival.location); !told) return fail(told.error());
  return row;
}

Result<ObjectRow> Placer::adopt(const Arrival& arrival, ObjectRow row,
                                std::optional<std::uint32_t> document) {
  if (document) {
    const std::uint32_t own = std::exchange(row.documentID, *document);
    if (auto written = store_.put(row); !written) return fail(written.error());
    for (const auto& [id, holder] :
         {std::pair(own, std::uint64_t{0}), std::pair(*document, row.fileID)}) {
      if (id == 0) continue;
      if (auto told = recorder_.handedOn(id, 0, holder); !told) return fail(told.error());
    }
  }
  return placeKnown(arrival, std::move(row));
}

// What was there before -------------------------------------------------------------------------

Placer::Inheritance Placer::vacate(const Arrival& arrival, std::uint64_t arrivingSlot) {
  if (!arrival.isOccupied) return std::nullopt;
  auto link = store_.linkAt(arrival.location.folder, arrival.location.name);
  if (!link) return fail(link.error());
  if (*link) {
    auto removed = store_.removeLink(arrival.location.folder, arrival.location.name);
    if (!removed) return fail(removed.error());
    return std::nullopt;
  }
  auto occupant = store_.objectAt(arrival.location.folder, arrival.location.name);
  if (!occupant) return fail(occupant.error());
  if (!*occupant || (arrivingSlot != 0 && (*occupant)->slot == arrivingSlot)) return std::nullopt;
  auto elsewhere = promoteLink(**occupant);
  if (!elsewhere) return fail(elsewhere.error());
  if (*elsewhere) return std::nullopt;
  // Where a folder or a link went is found out when somebody asks, unless there is a history to
  // tell of it; whose a document is, now.
  const bool isDocument = (*occupant)->documentID != 0 && isDocumentKind((*occupant)->kind);
  if (isDocument || recorder_.isActive()) return settleOccupant(arrival, std::move(**occupant));
  (*occupant)->location.reset();
  if (auto detached = store_.put(**occupant); !detached) return fail(detached.error());
  return std::nullopt;
}

Placer::Inheritance Placer::settleOccupant(const Arrival& arrival, ObjectRow occupant) {
  const Deeper deeper(depth_);
  const ObjectRow before = occupant;
  occupant.location.reset();
  if (auto detached = store_.put(occupant); !detached) return fail(detached.error());
  if (depth_ > deepestChain) return std::nullopt;
  const bool canInherit =
      occupant.kind == arrival.kind && isDocumentKind(occupant.kind) && occupant.documentID != 0;
  const auto found = finder_.find(occupant, arrival.folderPath, others_);
  const bool isBackup = found && found->folderPath == arrival.folderPath &&
                        isBackupName(found->name, arrival.location.name);
  std::optional<std::uint32_t> inherited;
  if (canInherit && (!found || isBackup)) {
    inherited = std::exchange(occupant.documentID, 0);
    if (auto written = store_.put(occupant); !written) return fail(written.error());
  }
  if (found) {
    auto told = recorder_.changed(before, *before.location);
    if (!told) return fail(told.error());
    auto moved = placeFound(std::move(occupant), *found);
    if (!moved) return fail(moved.error());
    return inherited;
  }
  // The document may go on; the object, and what lay in it, does not.
  if (auto told = recorder_.gone(occupant, *before.location); !told) return fail(told.error());
  return inherited;
}

Placer::Inheritance Placer::takeHandover(const Arrival& arrival, std::uint32_t ownDocument) {
  if (!arrival.isOccupied || !isDocumentKind(arrival.kind)) return std::nullopt;
  auto document = store_.handoverAt(arrival.location.folder, arrival.location.name);
  if (!document) return fail(document.error());
  if (!*document || **document == ownDocument) return std::nullopt;
  if (auto ended = store_.removeHandovers(**document); !ended) return fail(ended.error());
  auto holder = store_.objectByDocumentID(**document);
  if (!holder) return fail(holder.error());
  if (!*holder) return *document;
  ObjectRow& backup = **holder;
  const bool stands =
      backup.kind == arrival.kind &&
      (!backup.location || (backup.location->folder == arrival.location.folder &&
                            isBackupName(backup.location->name, arrival.location.name)));
  if (!stands) return std::nullopt;
  backup.documentID = 0;
  if (backup.location) {
    auto own = allocator_.nextDocumentID();
    if (!own) return fail(own.error());
    backup.documentID = *own;
  }
  if (auto written = store_.put(backup); !written) return fail(written.error());
  if (backup.location) {
    auto told = tellChange(backup, *backup.location, false);
    if (!told) return fail(told.error());
  }
  return *document;
}

Result<bool> Placer::promoteLink(ObjectRow& row) {
  auto names = store_.links(row.slot);
  if (!names) return fail(names.error());
  for (const Location& name : *names) {
    if (auto removed = store_.removeLink(name.folder, name.name); !removed) {
      return fail(removed.error());
    }
    auto still = isStillAt(row, name);
    if (!still) return still;
    if (!*still) continue;
    row.location = name;
    if (auto written = store_.put(row); !written) return fail(written.error());
    return true;
  }
  return false;
}

Result<void> Placer::dropLinks(std::uint64_t slot) {
  auto names = store_.links(slot);
  if (!names) return fail(names.error());
  for (const Location& name : *names) {
    if (auto removed = store_.removeLink(name.folder, name.name); !removed) return removed;
  }
  return {};
}

Result<void> Placer::ensureDocument(ObjectRow& row) {
  if (!isDocumentKind(row.kind) || row.documentID != 0) return {};
  auto next = allocator_.nextDocumentID();
  if (!next) return fail(next.error());
  row.documentID = *next;
  return {};
}

Result<ObjectRow> Placer::put(ObjectRow row) {
  if (auto written = store_.put(row); !written) return fail(written.error());
  return row;
}

}  // namespace mirabel
