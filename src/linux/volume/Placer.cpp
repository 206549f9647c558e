#include "linux/volume/Placer.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "foundation/LookFailure.h"

namespace mirabel {
namespace {

// Names an object that is off its old place and not yet at its new one.
class Moving {
 public:
  Moving(std::vector<std::uint64_t>& all, std::uint64_t fileID) : all_(all) {
    all_.push_back(fileID);
  }
  ~Moving() { all_.pop_back(); }
  Moving(const Moving&) = delete;
  Moving& operator=(const Moving&) = delete;

 private:
  std::vector<std::uint64_t>& all_;
};

Error wentAwayOr(const Error& error) {
  return saysOutOfReach(error) ? Error::posix(ESTALE) : error;
}

}  // namespace

Placer::Placer(IdentityStore& store, IdentifierAllocator& allocator, ChangeRecorder& recorder,
               ObjectFinder& finder, const MonitoredRoots& roots, const IndexedPaths& paths,
               FolderIdentities& folders, std::uint64_t device,
               std::function<bool(std::string_view)> isPackageName)
    : store_(store),
      allocator_(allocator),
      recorder_(recorder),
      finder_(finder),
      roots_(roots),
      paths_(paths),
      folders_(folders),
      device_(device),
      isPackageName_(std::move(isPackageName)) {}

Result<Slot> Placer::slotOf(const SeenObject& seen) {
  const auto fileSystem = fileSystemOf(seen, device_);
  if (!fileSystem) return fail(wentAwayOr(fileSystem.error()));
  auto row = *fileSystem == 0 ? store_.objectByInode(seen.status.inode)
                              : store_.foreignObject(*fileSystem, seen.status.inode);
  if (!row) return fail(row.error());
  return Slot{*fileSystem, std::move(*row)};
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
  if (!look) return fail(wentAwayOr(look.error()));
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
  const bool isInPlace = row.location == arrival.location;
  bool isKnownName = isInPlace;
  const bool changed =
      changedKind || hasChanged(row, arrival.seen.status) || (arrival.isReported && !row.isSettled);
  const bool stale = changed || isStale(row, arrival.seen.status);
  row.kind = arrival.kind;
  refresh(row, arrival.seen.status);
  const std::uint32_t before = row.documentID;
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  if (!isKnownName) {
    auto link = store_.linkAt(arrival.location.folder, arrival.location.name);
    if (!link) return fail(link.error());
    isKnownName = *link == row.slot;
    auto further = isFurtherLink(arrival, row);
    if (!further) return fail(further.error());
    if (!*further) return moveTo(arrival, std::move(row), changedKind);
  }
  if (isKnownName && !stale && row.documentID == before) return row;
  auto written =
      isInPlace && row.documentID == before ? putState(std::move(row)) : put(std::move(row));
  if (!written || (isKnownName && !changed)) return written;
  if (auto told = tellChange(*written, arrival.location, changedKind); !told) {
    return fail(told.error());
  }
  return written;
}

// An object that changed is told under each of its names.
Result<void> Placer::tellChange(const ObjectRow& row, const Location& location, bool changedKind) {
  if (!recorder_.isActive()) return {};
  auto names = store_.links(row.slot);
  if (!names) return fail(names.error());
  if (row.location) names->push_back(*row.location);
  if (std::ranges::find(*names, location) == names->end()) names->push_back(location);
  for (const Location& name : *names) {
    if (auto told = recorder_.changed(row, name, changedKind); !told) return told;
  }
  return changedKind ? recorder_.contents(row.fileID) : Result<void>();
}

Result<bool> Placer::isFurtherLink(const Arrival& arrival, ObjectRow& row) {
  if (arrival.seen.status.linkCount < 2 || arrival.seen.status.kind == FileKind::folder) {
    return false;
  }
  auto link = store_.linkAt(arrival.location.folder, arrival.location.name);
  if (!link) return fail(link.error());
  if (*link == row.slot) return true;
  if (!row.location) return false;
  auto still = stands(row, *row.location);
  if (!still || !*still) return still;
  // Linking over a document ends it: the object that arrives is shown under its other names too,
  // and keeps the identity that it has there.
  if (auto vacated = vacate(arrival, row.slot); !vacated) return fail(vacated.error());
  // Making room may have touched this row too: another of its names may have been a document's.
  auto current = store_.objectInSlot(row.slot);
  if (!current) return fail(current.error());
  if (*current) {
    row.documentID = (*current)->documentID;
    row.location = std::move((*current)->location);
  }
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  if (auto added = store_.addLink(arrival.location, row.slot); !added) return fail(added.error());
  return true;
}

Result<ObjectRow> Placer::moveTo(const Arrival& arrival, ObjectRow row, bool changedKind) {
  const std::optional<Location> from = std::exchange(row.location, std::nullopt);
  if (auto noted = noteArrival(row, from); !noted) return fail(noted.error());
  // Off its old name first: what is found to lie there now can then be put there.
  if (auto detached = store_.put(row); !detached) return fail(detached.error());
  const Moving moving(moving_, row.fileID);
  if (arrival.seen.status.linkCount < 2) {
    auto names = store_.links(row.slot);
    if (!names) return fail(names.error());
    if (auto dropped = dropLinks(row.slot); !dropped) return fail(dropped.error());
    for (const Location& name : *names) {
      if (auto told = recorder_.changed(row, name); !told) return fail(told.error());
    }
  }
  auto inherited = inherit(arrival, row.slot, row.documentID);
  if (!inherited) return fail(inherited.error());
  // Making room may have touched this row too.
  auto current = store_.objectInSlot(row.slot);
  if (!current) return fail(current.error());
  if (*current) row.documentID = (*current)->documentID;
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  const std::uint32_t own = row.documentID;
  row.documentID = inherited->value_or(own);
  row.location = arrival.location;
  for (const std::uint32_t document : {own, row.documentID}) {
    if (auto ended = store_.removeHandovers(document); !ended) return fail(ended.error());
  }
  // Also when this took the place, and the document, of an older backup.
  if (from && isBackupOf(arrival.location, *from) && isDocumentKind(row.kind)) {
    auto noted = store_.addHandover(*from, {own, row.kind});
    if (!noted) return fail(noted.error());
  }
  auto written = put(std::move(row));
  if (!written) return written;
  if (*inherited) {
    // Its own document ends here, at least for now: the name's goes on.
    auto told = recorder_.handedOn(own, written->fileID, 0);
    if (told) told = recorder_.handedOn(**inherited, 0, written->fileID);
    if (!told) return fail(told.error());
  }
  auto told = recorder_.moved(*written, from, arrival.location, changedKind);
  // It may have been written to as well, and this look is the one that would tell.
  auto others = store_.links(written->slot);
  if (!others) return fail(others.error());
  for (const Location& name : *others) {
    if (told) told = recorder_.changed(*written, name, changedKind);
  }
  if (told && changedKind) told = tellChange(*written, arrival.location, true);
  if (!told) return fail(told.error());
  return written;
}

Result<void> Placer::noteArrival(const ObjectRow& row, const std::optional<Location>& from) {
  if (row.kind != ObjectKind::folder && row.kind != ObjectKind::package) return {};
  if (from) {
    auto path = paths_.pathOf(*from);
    if (!path) return fail(path.error());
    if (*path) return {};
  }
  arrivedFolders_.insert(row.fileID);
  return {};
}

Result<ObjectRow> Placer::placeFound(ObjectRow row, const ObjectFinder::Found& found) {
  auto folder = roots_.openHolder(found.folderPath);
  // The way there is changing right now: whoever looks next finds out.
  const auto isChanging = [](const Error& error) {
    return error.isPosix(ESTALE) || saysOutOfReach(error);
  };
  if (!folder && isChanging(folder.error())) return row;
  if (!folder) return fail(folder.error());
  auto id = folders_.folderID(found.folderPath, folder->get());
  if (!id && isChanging(id.error())) return row;
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
  auto document = slot.row ? retire(*slot.row, arrival) : std::nullopt;
  if (document && !*document && arrival.isOccupied) {
    document = inherit(arrival, 0, 0);
    // What made room may have gone into this very folder, and have put it into the index.
    auto again = slotOf(arrival.seen);
    if (!again) return fail(again.error());
    if (again->row && compare(*again->row, arrival.seen) == Match::same) {
      return document ? adopt(arrival, std::move(*again->row), *document)
                      : Result<ObjectRow>(fail(document.error()));
    }
  }
  if (!document) return fail(document.error());
  if (slot.row) {
    if (auto removed = store_.remove(slot.row->slot); !removed) return fail(removed.error());
  }
  ObjectRow row;
  row.kind = arrival.kind;
  row.location = arrival.location;
  row.inode = arrival.seen.status.inode;
  row.fileSystem = slot.fileSystem;
  row.handle = std::move(handle);
  refresh(row, arrival.seen.status);
  const bool ownNumber = slot.fileSystem == 0 && row.inode < upperFileIDs;
  if (ownNumber && !slot.row && !allocator_.isSpent(row.inode)) {
    row.fileID = row.inode;
  } else {
    auto next = allocator_.nextFileID();
    if (!next) return fail(next.error());
    row.fileID = *next;
  }
  row.documentID = document->value_or(0);
  if (*document) {
    if (auto ended = store_.removeHandovers(**document); !ended) return fail(ended.error());
  }
  if (auto ensured = ensureDocument(row); !ensured) return fail(ensured.error());
  const bool isOwnDocument = !*document && row.documentID != 0;
  row.slot = isOwnDocument ? row.documentID : allocator_.nextUpperSlot();
  if (auto inserted = store_.insert(row); !inserted) return fail(inserted.error());
  Result<void> told = noteArrival(row, std::nullopt);
  if (told && *document) told = recorder_.handedOn(**document, 0, row.fileID);
  if (told) told = recorder_.changed(row, arrival.location);
  if (!told) return fail(told.error());
  return row;
}

Result<ObjectRow> Placer::adopt(const Arrival& arrival, ObjectRow row,
                                std::optional<std::uint32_t> document) {
  if (!document || !isDocumentKind(row.kind)) return placeKnown(arrival, std::move(row));
  if (auto own = take(row); !own) return fail(own.error());
  row.documentID = *document;
  if (auto written = store_.put(row); !written) return fail(written.error());
  if (auto told = recorder_.handedOn(*document, 0, row.fileID); !told) return fail(told.error());
  return placeKnown(arrival, std::move(row));
}

Result<void> Placer::ensureDocument(ObjectRow& row) {
  if (!isDocumentKind(row.kind) || row.documentID != 0) return {};
  auto next = allocator_.nextDocumentID();
  if (!next) return fail(next.error());
  row.documentID = *next;
  return {};
}

Result<ObjectRow> Placer::putState(ObjectRow row) {
  if (auto written = store_.putState(row); !written) return fail(written.error());
  return row;
}

Result<ObjectRow> Placer::put(ObjectRow row) {
  if (auto written = store_.put(row); !written) return fail(written.error());
  return row;
}

}  // namespace mirabel
