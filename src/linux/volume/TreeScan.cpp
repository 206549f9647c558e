#include "linux/volume/TreeScan.h"

#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <utility>

#include "foundation/SplitWork.h"
#include "linux/kernel/RawDirectory.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {
namespace {

constexpr std::size_t pieceSize = 64;

bool isDots(std::string_view name) {
  return name == "." || name == "..";
}

// What was to be read has gone, or another folder has come to its path, since it was seen.
bool isDisturbance(const Error& error) {
  return error.isPosix(ESTALE) || error.isPosix(ENOENT) || error.isPosix(ENOTDIR) ||
         error.isPosix(ELOOP);
}

// Not to be read by this user, or a volume of its own. Anything else, such as too many open files,
// must not look like an empty folder.
bool isClosedToUs(const Error& error) {
  return error.isPosix(EACCES) || error.isPosix(EPERM) || error.isPosix(EXDEV);
}

}  // namespace

void TreeScan::add(std::string path, std::uint64_t id, Depth depth) {
  pending_.push_back({std::move(path), id, depth});
}

Result<void> TreeScan::addRoots() {
  const MonitoredRoots& roots = context_.roots;
  for (std::size_t i = 0; i < roots.paths().size(); ++i) {
    // One that is not there holds nothing.
    if (roots.descriptor(i) < 0) {
      if (auto noted = missing_.add(0, roots.paths()[i]); !noted) return noted;
      continue;
    }
    auto id = context_.learner.folderID(roots.paths()[i], roots.descriptor(i));
    if (!id) return fail(id.error());
    add(roots.paths()[i], *id, Depth::everything);
  }
  return {};
}

void TreeScan::clear() {
  pending_.clear();
  read_.clear();
  watchFailure_.reset();
}

Result<void> TreeScan::run(const Transaction& transaction) {
  while (!pending_.empty()) {
    if (auto done = transaction([&] { return readBatch(); }); !done) return done;
  }
  return {};
}

// Many small folders share a transaction, for each costs a write to disk.
Result<void> TreeScan::readBatch() {
  entriesRead_ = 0;
  while (!pending_.empty() && entriesRead_ < entriesPerTransaction) {
    const Folder folder = std::move(pending_.back());
    pending_.pop_back();
    // It was watched from before it was read: what came since is told.
    if (read_.contains(folder.id)) continue;
    auto done = read(folder);
    if (!done && isDisturbance(done.error())) {
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
  if (!opened && !isClosedToUs(opened.error())) return fail(opened.error());
  if (!opened) {
    unreadable_.insert(folder.id);
    read_.insert(folder.id);
    return findMissing(folder);
  }
  auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  // What is mounted there, or is a volume of its own, is another's.
  if (status->device != context_.device) return findMissing(folder);
  auto id = context_.learner.folderID(folder.path, opened->get());
  if (!id) return fail(id.error());
  watch(opened->get(), *id);
  // Open anew, now that it is watched: btrfs gives what was there when a folder was opened, and
  // what came between that and the mark would be in neither.
  UniqueFd reading(::openat(opened->get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!reading) return fail(Error::posix(errno));
  const Folder itself{folder.path, *id, folder.depth};
  auto done = lookAtItself(itself, opened->get());
  if (done) done = readEntries(itself, std::move(reading));
  if (!done) {
    // Who is watched is known: whoever meets it under its new name reads it.
    if (watcher_ != nullptr) watcher_->forget(*id);
    return done;
  }
  unreadable_.erase(*id);
  read_.insert(*id);
  return {};
}

/// Since it was seen in the folder above, something may have come into it, or left.
Result<void> TreeScan::lookAtItself(const Folder& folder, int descriptor) {
  auto row = context_.store.objectByFileID(folder.id);
  if (!row) return fail(row.error());
  auto status = statusAt(descriptor, "");
  if (!status) return fail(status.error());
  if (!*row || !(*row)->location || (*row)->location->folder == 0) return {};
  if (!hasChanged(**row, *status)) return {};
  const bool isPackage = context_.isPackageName((*row)->location->name);
  auto learned = context_.learner.learnPath(folder.path, *status, isPackage);
  if (!learned) return fail(learned.error());
  return {};
}

void TreeScan::watch(int folder, std::uint64_t id) {
  if (watcher_ == nullptr || watchFailure_) return;
  auto watched = watcher_->watch(folder, id);
  // Closed to us since it was opened: then its parent hears when that changes.
  if (!watched && !watched.error().isPosix(EACCES)) watchFailure_ = watched.error();
}

Result<void> TreeScan::readEntries(const Folder& folder, UniqueFd opened) {
  const int descriptor = opened.get();
  RawDirectory directory(std::move(opened));
  std::uint64_t names = 0;
  std::vector<Sighting> batch;
  while (true) {
    auto entry = directory.next();
    if (!entry) return fail(entry.error());
    if (*entry && !isDots((*entry)->name)) {
      batch.push_back({std::string((*entry)->name), {}, false});
    }
    if (batch.size() < entriesPerTransaction && *entry) continue;
    auto taken = takeIn(folder, descriptor, batch);
    if (!taken) return fail(taken.error());
    names += *taken;
    entriesRead_ += batch.size();
    batch.clear();
    if (!*entry) break;
  }
  auto known = context_.store.nameCount(folder.id);
  if (!known) return fail(known.error());
  return *known == names ? Result<void>() : findMissing(folder);
}

Result<std::uint64_t> TreeScan::takeIn(const Folder& folder, int descriptor,
                                       std::vector<Sighting>& batch) {
  std::vector<char> isThere(batch.size(), 0);
  std::atomic<int> failure = 0;
  splitWork(batch.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      auto status = statusAt(descriptor, batch[i].name);
      if (!status && !status.error().isPosix(ENOENT) && !status.error().isPosix(EACCES)) {
        failure = static_cast<int>(status.error().code);
      }
      if (!status) continue;
      isThere[i] = 1;
      batch[i].status = *status;
    }
  });
  if (failure != 0) return fail(Error::posix(failure));
  std::size_t kept = 0;
  for (std::size_t i = 0; i < batch.size(); ++i) {
    if (isThere[i] == 0) continue;
    if (kept != i) batch[kept] = std::move(batch[i]);
    Sighting& sighting = batch[kept++];
    // What was looked at right after a change may have had another one since.
    sighting.isReported = timesAreCoarse();
    sighting.isPackage =
        sighting.status.kind == FileKind::folder && context_.isPackageName(sighting.name);
  }
  batch.resize(kept);
  if (auto learned = context_.learner.learn(folder.path, descriptor, batch); !learned) {
    return fail(learned.error());
  }
  std::uint64_t placed = 0;
  for (const Sighting& sighting : batch) {
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
