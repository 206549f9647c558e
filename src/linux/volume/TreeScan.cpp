#include "linux/volume/TreeScan.h"

#include <cerrno>
#include <fcntl.h>
#include <iterator>
#include <optional>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/kernel/RawDirectory.h"
#include "linux/volume/DiskEntry.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {
namespace {

// Not to be read by this user, or a volume of its own.
bool isClosedToUs(const Error& error) {
  return lookFailure(error) == LookFailure::closed;
}

// Whether what was looked at right after a change may have had another one since.
bool mayChangeUnseen(int object) {
  const auto status = statusAt(object, "");
  return timesAreCoarse(object) || !status || isCoarseStamp(status->changeTime);
}

// What was to be read has gone, or another folder has come to its path, since it was seen.
bool wasReplaced(const Error& error) {
  return error.isPosix(ESTALE) || saysAbsent(error);
}

}  // namespace

void TreeScan::add(std::string path, std::uint64_t id, Depth depth) {
  pending_.push_back({std::move(path), id, depth});
}

Result<void> TreeScan::addRoots() {
  for (const std::string& path : context_.roots.paths()) {
    if (auto added = addRoot(path); !added) return added;
  }
  return {};
}

Result<void> TreeScan::addRoot(const std::string& path) {
  auto folder = context_.roots.open(path, O_PATH | O_DIRECTORY);
  // One that is not there holds nothing.
  if (!folder && isDisturbance(folder.error())) return missing_.add(0, path);
  if (!folder) return fail(folder.error());
  // Nobody above it is read who would see what has become of itself.
  const bool isItem = path != context_.roots.firstPath();
  auto id = isItem ? context_.learner.rootID(path, mayChangeUnseen(folder->get()))
                   : context_.learner.folderID(path, folder->get());
  // A library may have a volume mounted over it whose server is dead.
  const bool isOver = !id && isItem && isClosedToUs(id.error());
  if (isOver || (!id && wasReplaced(id.error()))) return missing_.add(0, path);
  if (!id) return fail(id.error());
  add(path, *id, Depth::everything);
  return {};
}

void TreeScan::clear() {
  pending_.clear();
  read_.clear();
  watchFailure_.reset();
}

Result<void> TreeScan::run(const Transaction& transaction, const Pause& pause) {
  while (!pending_.empty()) {
    if (auto done = transaction([&] { return readBatch(pause); }); !done) return done;
  }
  return {};
}

// Many small folders share a transaction: each costs a write to disk, and writes the pages of the
// indexes that were touched, which for a whole tree are all of them.
Result<void> TreeScan::readBatch(const Pause& pause) {
  constexpr std::size_t mostEntries = 4 * entriesPerTransaction;
  std::size_t nextPause = entriesPerPause;
  entriesRead_ = 0;
  while (!pending_.empty() && entriesRead_ < mostEntries) {
    if (entriesRead_ >= nextPause) {
      if (auto paused = pause(); !paused) return paused;
      nextPause = entriesRead_ + entriesPerPause;
    }
    const Folder folder = std::move(pending_.back());
    pending_.pop_back();
    // It was watched from before it was read: what came since is told.
    if (read_.contains(folder.id)) continue;
    auto done = read(folder);
    if (!done && wasReplaced(done.error())) {
      disturbed_.push_back(folder.id);
      continue;
    }
    if (!done) return done;
  }
  return {};
}

Result<void> TreeScan::read(const Folder& folder) {
  ++entriesRead_;
  auto opened = context_.roots.open(folder.path, O_RDONLY | O_DIRECTORY);
  if (!opened && isClosedToUs(opened.error())) return passOver(folder);
  if (!opened) return fail(opened.error());
  auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  // What is mounted there, or is a volume of its own, is another's.
  if (status->device != context_.device) return findMissing(folder);
  auto id = context_.learner.folderID(folder.path, opened->get(), *status);
  if (!id) return fail(id.error());
  watch(opened->get(), *id);
  const Folder itself{folder.path, *id, folder.depth};
  auto begun = beginReading(std::move(*opened));
  // Closed since it was opened.
  if (!begun && isClosedToUs(begun.error())) return passOver(itself);
  if (!begun) return giveUp(itself, begun.error());
  if (auto done = readNext(*begun); !done) return giveUp(itself, done.error());
  return takeIn(itself, std::move(*begun));
}

Result<void> TreeScan::passOver(const Folder& folder) {
  if (auto awaited = awaitOpening(folder); !awaited) return awaited;
  unreadable_[folder.id] = 1;
  read_.insert(folder.id);
  return findMissing(folder);
}

/// Nobody else tells that it can be read again.
Result<void> TreeScan::awaitOpening(const Folder& folder) {
  if (watcher_ == nullptr) return {};
  const auto closed = context_.roots.open(folder.path, O_PATH | O_DIRECTORY);
  // One above it is closed as well, or it is another's.
  if (!closed && isClosedToUs(closed.error())) return {};
  if (!closed) return fail(closed.error());
  auto id = context_.learner.folderID(folder.path, closed->get());
  if (!id) return fail(id.error());
  if (*id != folder.id) return fail(Error::posix(ESTALE));
  watch(closed->get(), folder.id);
  return {};
}

/// Who is watched is known: whoever meets the folder under its new name reads it.
Result<void> TreeScan::giveUp(const Folder& folder, const Error& error) {
  if (watcher_ != nullptr) watcher_->forget(folder.id);
  if (error.domain != ErrorDomain::posix) return fail(error);
  const auto entry = error.userInfo.find(errorkey::detail);
  // Of something else, such as a file of the state.
  if (entry != error.userInfo.end() && entry->second.starts_with('/')) return fail(error);
  const std::string name = entry == error.userInfo.end() ? "" : "/" + entry->second;
  return fail(Error::posix(static_cast<int>(error.code), "\"" + folder.path + name + "\""));
}

std::size_t TreeScan::unreadableFolders() const {
  std::size_t count = 0;
  for (const auto& [id, folders] : unreadable_) {
    const auto row = context_.store.objectByFileID(id);
    if (!row || !*row || !(*row)->location) continue;
    const auto path = context_.paths.pathOf(*(*row)->location);
    if (path && *path) count += folders;
  }
  return count;
}

Result<void> TreeScan::takeIn(const Folder& folder, FolderReading reading) {
  auto done = lookAtItself(folder, reading.status);
  if (done) done = takeInEntries(folder, reading);
  if (!done && isClosedToUs(done.error())) return passOver(folder);
  if (!done) return giveUp(folder, done.error());
  if (reading.deadMounts == 0) unreadable_.erase(folder.id);
  if (reading.deadMounts != 0) unreadable_[folder.id] = reading.deadMounts;
  read_.insert(folder.id);
  return {};
}

/// Since it was seen in the folder above, something may have come into it, or left.
Result<void> TreeScan::lookAtItself(const Folder& folder, const ObjectStatus& status) {
  auto row = context_.store.objectByFileID(folder.id);
  if (!row) return fail(row.error());
  if (!*row || !(*row)->location || (*row)->location->folder == 0) return {};
  if (!hasChanged(**row, status)) return {};
  const bool isPackage = context_.isPackageName((*row)->location->name);
  auto learned = context_.learner.learnPath(folder.path, status, isPackage);
  if (!learned) return fail(learned.error());
  return {};
}

void TreeScan::watch(int folder, std::uint64_t id) {
  if (watcher_ == nullptr || watchFailure_) return;
  auto watched = watcher_->watch(folder, id);
  unheard_.erase(id);
  if (watched) return;
  // Closed to us: then it is heard of when that changes.
  const bool isClosed = watched.error().isPosix(EACCES);
  if (!isClosed) watchFailure_ = watched.error();
  if (isClosed && !watcher_->isWatched(id)) unheard_.insert(id);
}

Result<void> TreeScan::lookAtUnheard() {
  for (auto id = unheard_.begin(); id != unheard_.end();) {
    auto isThere = lookAtUnheard(*id);
    if (!isThere) return fail(isThere.error());
    id = *isThere ? std::next(id) : unheard_.erase(id);
  }
  return {};
}

Result<bool> TreeScan::lookAtUnheard(std::uint64_t id) {
  auto row = context_.store.objectByFileID(id);
  if (!row) return fail(row.error());
  if (!*row || !(*row)->location) return false;
  auto path = context_.paths.pathOfFolder(**row);
  if (!path) return fail(path.error());
  if (!*path) return false;
  const auto look = lookAt(context_.roots, **path);
  if (!look && !saysOutOfReach(look.error())) return fail(look.error());
  // Elsewhere by now, which a record has told.
  if (!look || look->seen.status.inode != (*row)->inode) return true;
  auto done = lookAtItself({**path, id, Depth::folder}, look->seen.status);
  if (!done && !isDisturbance(done.error())) return fail(done.error());
  return true;
}

Result<void> TreeScan::takeInEntries(const Folder& folder, FolderReading& reading) {
  std::uint64_t names = 0;
  while (true) {
    auto placed = takeInBatch(folder, reading);
    if (!placed) return fail(placed.error());
    names += *placed;
    entriesRead_ += reading.entries.size();
    if (reading.isAtEnd()) break;
    if (auto done = readNext(reading); !done) return done;
  }
  auto known = context_.store.nameCount(folder.id);
  if (!known) return fail(known.error());
  return *known == names ? Result<void>() : findMissing(folder);
}

/// Answers how many of them have a place now.
Result<std::uint64_t> TreeScan::takeInBatch(const Folder& folder, FolderReading& reading) {
  const bool areCoarse = timesAreCoarse(reading.folder.get());
  for (Sighting& sighting : reading.entries) {
    // What was looked at right after a change may have had another one since.
    sighting.isReported = areCoarse || isCoarseStamp(sighting.status.changeTime);
    sighting.isPackage =
        sighting.status.kind == FileKind::folder && context_.isPackageName(sighting.name);
  }
  auto learned =
      context_.learner.learn(folder.path, reading.folder.get(), folder.id, reading.entries);
  if (!learned) return fail(learned.error());
  std::uint64_t placed = 0;
  for (const Sighting& sighting : reading.entries) {
    if (sighting.fileID == 0) continue;
    ++placed;
    const bool isFolder =
        sighting.status.kind == FileKind::folder && sighting.status.device == context_.device;
    if (!isFolder) continue;
    const bool isFollowed = watcher_ != nullptr && watcher_->isWatched(sighting.fileID);
    if (folder.depth == Depth::folder && isFollowed) continue;
    add(folder.path + "/" + sighting.name, sighting.fileID, Depth::everything);
  }
  return placed;
}

Result<void> TreeScan::findMissing(const Folder& folder) {
  std::unordered_set<std::string> names;
  auto opened = context_.roots.open(folder.path, O_RDONLY | O_DIRECTORY);
  const auto status = opened ? statusAt(opened->get(), "") : fail(opened.error());
  // Too many open files, for one, must not look like an empty folder.
  if (!status && !isDisturbance(status.error())) return fail(status.error());
  if (status && status->device == context_.device) {
    // Another folder by now: what it does not hold is not missing.
    auto id = context_.learner.folderID(folder.path, opened->get());
    if (!id) return fail(id.error());
    if (*id != folder.id) return fail(Error::posix(ESTALE));
    RawDirectory directory(std::move(*opened));
    while (true) {
      auto entry = directory.next();
      if (!entry) return fail(entry.error());
      if (!*entry) break;
      names.emplace((*entry)->name);
    }
  }
  auto children = context_.store.childrenOf(folder.id);
  if (!children) return fail(children.error());
  for (ObjectRow& child : *children) {
    if (!names.contains(child.location->name)) {
      missing_.addObject(child.slot, std::move(*child.location));
    }
  }
  auto links = context_.store.linksIn(folder.id);
  if (!links) return fail(links.error());
  for (auto& [name, slot] : *links) {
    if (!names.contains(name)) missing_.addLink(slot, {folder.id, std::move(name)});
  }
  return {};
}

}  // namespace mirabel
