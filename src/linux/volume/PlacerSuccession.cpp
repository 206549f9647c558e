// What stood under a name before another object came to it, and whose document goes on.
#include <algorithm>
#include <cerrno>
#include <utility>

#include "linux/volume/Placer.h"

namespace mirabel {
namespace {

// Moves that uncover moves. Each detaches a row first, so this is only reached when names change
// faster than they are read.
constexpr int deepestChain = 64;

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

// The number's former holder is gone for sure, and its document waits under every name that it had.
Placer::Inheritance Placer::retire(ObjectRow former, const Arrival& arrival) {
  auto names = store_.links(former.slot);
  if (!names) return fail(names.error());
  if (auto dropped = dropLinks(former.slot); !dropped) return fail(dropped.error());
  if (former.location) names->push_back(std::move(*former.location));
  former.location.reset();
  for (const Location& name : *names) {
    if (auto told = recorder_.gone(former, name); !told) return fail(told.error());
  }
  auto taken = take(former);
  if (!taken) return fail(taken.error());
  const std::uint32_t document = *taken;
  if (auto written = store_.put(former); !written) return fail(written.error());
  if (document == 0 || !isDocumentKind(former.kind)) return std::nullopt;
  const bool hadThisName = std::ranges::find(*names, arrival.location) != names->end();
  if (hadThisName && former.kind == arrival.kind) return document;
  for (const Location& name : *names) {
    auto noted = store_.addHandover(name, {document, former.kind});
    if (!noted) return fail(noted.error());
  }
  return std::nullopt;
}

Placer::Inheritance Placer::inherit(const Arrival& arrival, std::uint64_t arrivingSlot,
                                    std::uint32_t ownDocument) {
  auto inherited = vacate(arrival, arrivingSlot);
  if (!inherited || *inherited) return inherited;
  return takeHandover(arrival, ownDocument);
}

Placer::Inheritance Placer::vacate(const Arrival& arrival, std::uint64_t arrivingSlot) {
  const auto& [folder, name] = arrival.location;
  auto link = store_.linkAt(folder, name);
  if (!link) return fail(link.error());
  if (*link) {
    if (auto removed = store_.removeLink(folder, name); !removed) return fail(removed.error());
  }
  auto occupant = *link ? store_.objectInSlot(**link) : store_.objectAt(folder, name);
  if (!occupant) return fail(occupant.error());
  if (!*occupant || (*occupant)->slot == arrivingSlot) return std::nullopt;
  if (*link) {
    auto told = recorder_.changed(**occupant, arrival.location);
    if (!told) return fail(told.error());
  }
  auto elsewhere = hasOtherName(**occupant, arrival.location);
  if (!elsewhere) return fail(elsewhere.error());
  const bool isDocument = (*occupant)->documentID != 0 && isDocumentKind((*occupant)->kind);
  if (*elsewhere) {
    // It has a name less now, which its other names show.
    if (auto told = tellChange(**occupant, *(*occupant)->location, false); !told) {
      return fail(told.error());
    }
    const bool isBackup = isDocument && (*occupant)->kind == arrival.kind &&
                          isBackupOf(*(*occupant)->location, arrival.location);
    return isBackup ? handOver(std::move(**occupant)) : std::nullopt;
  }
  // Where a folder or a link went is found out when somebody asks, unless there is a history to
  // tell of it; whose a document is, now.
  if (isDocument || recorder_.isActive()) return settleOccupant(arrival, std::move(**occupant));
  (*occupant)->location.reset();
  if (auto detached = store_.put(**occupant); !detached) return fail(detached.error());
  return std::nullopt;
}

Result<bool> Placer::hasOtherName(ObjectRow& row, const Location& lost) {
  if (row.location && *row.location != lost) {
    auto still = stands(row, *row.location);
    if (!still || *still) return still;
  }
  return promoteLink(row);
}

Placer::Inheritance Placer::handOver(ObjectRow backup) {
  auto own = allocator_.nextDocumentID();
  if (!own) return fail(own.error());
  auto document = take(backup);
  if (!document) return fail(document.error());
  backup.documentID = *own;
  if (auto written = store_.put(backup); !written) return fail(written.error());
  if (auto told = tellChange(backup, *backup.location, false); !told) return fail(told.error());
  return *document;
}

Placer::Inheritance Placer::settleOccupant(const Arrival& arrival, ObjectRow occupant) {
  const Deeper deeper(depth_);
  const ObjectRow before = occupant;
  // One of which only a further link was known had this name, too. So had one whose folder is the
  // arrival itself, which is nowhere at this moment.
  Location from = arrival.location;
  if (occupant.location) {
    auto path = paths_.pathOf(*occupant.location);
    if (!path) return fail(path.error());
    if (*path) from = *occupant.location;
  }
  occupant.location.reset();
  if (auto detached = store_.put(occupant); !detached) return fail(detached.error());
  if (depth_ > deepestChain) return std::nullopt;
  const auto answer = finder_.find(occupant, arrival.folderPath, others_);
  if (!answer) return fail(answer.error());
  const auto& found = *answer;
  const bool isInSameFolder = found && found->folderPath == arrival.folderPath;
  // Whoever arrives was seen there a moment ago: names are changing hands faster than they are
  // read, and the next look will tell.
  if (isInSameFolder && found->name == arrival.location.name) return fail(Error::posix(ESTALE));
  const bool isBackup = isInSameFolder && isBackupName(found->name, arrival.location.name);
  const bool canInherit =
      occupant.kind == arrival.kind && isDocumentKind(occupant.kind) && occupant.documentID != 0;
  std::optional<std::uint32_t> inherited;
  if (canInherit && (!found || isBackup)) {
    auto taken = take(occupant);
    if (!taken) return fail(taken.error());
    inherited = *taken;
    if (auto written = store_.put(occupant); !written) return fail(written.error());
  }
  if (!found) {
    // Its own name is not the one that was taken: whoever knew it by that one is told.
    if (from != arrival.location) {
      if (auto told = recorder_.changed(before, from); !told) return fail(told.error());
    }
    // The document may go on; the object, and what lay in it, does not.
    if (auto told = recorder_.gone(occupant, from); !told) return fail(told.error());
    return inherited;
  }
  const bool changedKind =
      objectKind(found->status.kind, isPackageName_(found->name)) != before.kind;
  if (auto told = recorder_.changed(before, from, changedKind); !told) return fail(told.error());
  auto moved = placeFound(std::move(occupant), *found);
  if (!moved) return fail(moved.error());
  return inherited;
}

Placer::Inheritance Placer::takeHandover(const Arrival& arrival, std::uint32_t ownDocument) {
  auto waiting = store_.handoverAt(arrival.location.folder, arrival.location.name);
  if (!waiting) return fail(waiting.error());
  if (!*waiting || (*waiting)->kind != arrival.kind) return std::nullopt;
  const std::uint32_t document = (*waiting)->documentID;
  if (document == ownDocument) return std::nullopt;
  if (auto ended = store_.removeHandovers(document); !ended) return fail(ended.error());
  auto holder = store_.objectByDocumentID(document);
  if (!holder) return fail(holder.error());
  if (!*holder) return document;
  ObjectRow& backup = **holder;
  if (backup.kind != arrival.kind) return std::nullopt;
  if (backup.location) {
    if (!isBackupOf(*backup.location, arrival.location)) return std::nullopt;
    return handOver(std::move(backup));
  }
  if (auto taken = take(backup); !taken) return fail(taken.error());
  if (auto written = store_.put(backup); !written) return fail(written.error());
  return document;
}

Result<std::uint32_t> Placer::take(ObjectRow& holder) {
  // The document leaves every folder in which the holder has a name, and goes on in one at most.
  auto names = store_.links(holder.slot);
  if (!names) return fail(names.error());
  if (!names->empty()) {
    auto told = tellChange(holder, names->front(), false);
    if (!told) return fail(told.error());
  }
  const std::uint32_t document = std::exchange(holder.documentID, 0);
  if (document == 0) return document;
  takenDocuments_.insert(document);
  auto told = recorder_.handedOn(document, holder.fileID, 0);
  if (!told) return fail(told.error());
  return document;
}

// Where changes are heard of, a name in a folder that is itself being moved stands: its loss would
// be heard of under the folder, wherever that lies.
Result<bool> Placer::stands(const ObjectRow& row, const Location& name) const {
  auto still = paths_.isAt(row, name);
  if (!still || *still || !finder_.isFollowing()) return still;
  auto above = paths_.foldersAbove(name);
  if (!above) return fail(above.error());
  if (above->empty()) return false;
  auto outermost = store_.objectByFileID(above->front());
  if (!outermost) return fail(outermost.error());
  // In what is nowhere nothing stands, unless it is just being put elsewhere.
  const bool isAttached = *outermost && (*outermost)->location;
  if (!isAttached) return std::ranges::find(moving_, above->front()) != moving_.end();
  auto folder = paths_.folderStands(name);
  if (!folder) return folder;
  return !*folder;
}

Result<bool> Placer::promoteLink(ObjectRow& row) {
  auto names = store_.links(row.slot);
  if (!names) return fail(names.error());
  for (const Location& name : *names) {
    if (auto removed = store_.removeLink(name.folder, name.name); !removed) {
      return fail(removed.error());
    }
    auto still = stands(row, name);
    if (!still) return still;
    if (!*still) {
      // The index forgets that it had this name, so it is told now or never.
      if (auto told = recorder_.changed(row, name); !told) return fail(told.error());
      continue;
    }
    const std::optional<Location> from = std::exchange(row.location, name);
    if (auto written = store_.put(row); !written) return fail(written.error());
    if (auto told = recorder_.moved(row, from, name); !told) return fail(told.error());
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

}  // namespace mirabel
