#include "linux/volume/Follower.h"

#include <algorithm>
#include <cerrno>
#include <iterator>
#include <string>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

// A round takes in what was queued when it began. More than this many have something to do only
// when names change faster than they are read.
constexpr int mostRounds = 16;
// How often everything is compared in one go because records were dropped meanwhile.
constexpr int mostComparisons = 3;
constexpr std::chrono::minutes watchAgainAfter{1};

Result<void> noPause() {
  return {};
}

// The names under which folders came or left.
LookList::Folders takeFolders(LookList::Folders& looks) {
  LookList::Folders taken;
  for (auto& [folder, names] : looks) {
    for (auto name = names.begin(); name != names.end();) {
      const auto next = std::next(name);
      if (name->second.isOfFolder && !name->first.empty())
        taken[folder].insert(names.extract(name));
      name = next;
    }
  }
  return taken;
}

}  // namespace

Follower::Follower(IndexContext context, Options options)
    : context_(std::move(context)),
      options_(std::move(options)),
      missing_(context_),
      scan_(context_, missing_),
      places_(context_, missing_, scan_),
      recent_(context_) {}

Result<void> Follower::catchUp(const Transaction& transaction) {
  auto changed = options_.changedRoots();
  // What lies under a mount is neither seen nor heard of while that is there.
  const auto isBelowRoot = [this](std::string_view path) {
    const auto place = context_.roots.locate(path);
    return place && !place->relative.empty();
  };
  const bool haveMountsChanged = mounts_.hasChanged(isBelowRoot);
  if (!changed || changed->isFirst || haveMountsChanged) isInStep_ = false;
  if (!changed) return fail(changed.error());
  if (!isInStep_) return compareAll(transaction);
  addRoots(changed->further);
  auto added = addChangedRoots(transaction);
  auto outcome = added ? follow(transaction) : fail(added.error());
  if (!outcome) isInStep_ = false;
  if (!outcome) return fail(outcome.error());
  return *outcome == Outcome::inStep ? Result<void>() : compareAll(transaction);
}

void Follower::addRoots(const std::vector<std::string>& paths) {
  changedRoots_.insert(paths.begin(), paths.end());
}

Result<void> Follower::addChangedRoots(const Transaction& transaction) {
  if (changedRoots_.empty()) return {};
  auto added = transaction([&]() -> Result<void> {
    for (const std::string& path : changedRoots_) {
      if (!context_.roots.locate(path)) continue;
      if (auto done = scan_.addRoot(path); !done) return done;
    }
    return {};
  });
  if (added) changedRoots_.clear();
  return added;
}

// Following records -----------------------------------------------------------------------------

Result<Follower::Outcome> Follower::follow(const Transaction& transaction) {
  if (scan_.hasUnheard()) {
    auto looked = transaction([&] { return scan_.lookAtUnheard(); });
    if (!looked) return fail(looked.error());
  }
  for (int round = 0; round < mostRounds; ++round) {
    auto isSound = drain();
    if (!isSound) return fail(isSound.error());
    if (!*isSound || hasLost_) return Outcome::lost;
    if (auto added = addArrived(); !added) return fail(added.error());
    if (auto added = addDisturbed(); !added) return fail(added.error());
    if (looks_.isEmpty() && scan_.isEmpty()) break;
    looks_.merge(later_.take());
    // What is read after the last round would wait for the next record to wake somebody.
    const bool isLast = round + 1 == mostRounds;
    const Pause pause = isLast ? Pause(noPause) : [this] { return drainMeanwhile(); };
    if (auto done = followRound(transaction, pause, looks_.take()); !done)
      return fail(done.error());
    if (scan_.watchFailure()) return Outcome::lost;
  }
  if (auto settled = settle(transaction); !settled) return fail(settled.error());
  if (!later_.isEmpty() || scan_.wasDisturbed()) {
    // Mostly their folder is known by now to have gone.
    if (auto added = addDisturbed(); !added) return fail(added.error());
    if (auto done = followRound(transaction, noPause, later_.take()); !done)
      return fail(done.error());
    if (auto settled = settle(transaction); !settled) return fail(settled.error());
  }
  places_.addOthers(context_.recorder.takeSurvivors());
  if (places_.hasOthers()) {
    auto looked = transaction([&] { return places_.lookAtOthers(); });
    if (!looked) return fail(looked.error());
  }
  recent_.clear();
  // A folder is elsewhere, and no record has told of that.
  const bool isDone =
      later_.isEmpty() && !scan_.wasDisturbed() && !scan_.watchFailure() && !hasLost_;
  return isDone ? Outcome::inStep : Outcome::lost;
}

Result<void> Follower::followRound(const Transaction& transaction, const Pause& pause,
                                   LookList::Folders looks) {
  // Folders that came first: what was moved into them has not ended, whatever has its name now.
  LookList::Folders ofFolders = takeFolders(looks);
  if (!ofFolders.empty()) {
    if (auto done = lookAndScan(transaction, pause, std::move(ofFolders)); !done) return done;
  }
  return lookAndScan(transaction, pause, std::move(looks));
}

Result<void> Follower::lookAndScan(const Transaction& transaction, const Pause& pause,
                                   LookList::Folders looks) {
  auto later = places_.look(transaction, pause, *watcher_, std::move(looks));
  if (!later) return fail(later.error());
  later_.merge(std::move(*later));
  auto scanned = scanArrived(transaction, pause);
  if (!scan_.watchFailure()) scan_.clear();
  return scanned;
}

Result<void> Follower::settle(const Transaction& transaction) {
  if (missing_.isEmpty()) return {};
  return transaction([&] { return missing_.settle(); });
}

// The kernel's queue is read before it is full: what it holds more than that is lost.
Result<void> Follower::drainMeanwhile() {
  if (!watcher_) return {};
  auto isSound = drain();
  if (!isSound) return fail(isSound.error());
  if (!*isSound) hasLost_ = true;
  return {};
}

/// False when records were dropped.
Result<bool> Follower::drain() {
  LookList fresh;
  auto drained = watcher_->drain(fresh);
  if (!drained) return fail(drained.error());
  if (drained->hasLost) return false;
  recent_.add(fresh);
  looks_.merge(fresh.take());
  return true;
}

Result<std::optional<std::vector<RecentPlace>>> Follower::placesOf(std::uint64_t inode) {
  if (!isInStep_) return std::nullopt;
  auto isSound = drain();
  if (!isSound || !*isSound) {
    // Whoever is following records at this moment has lost some.
    hasLost_ = true;
    isInStep_ = false;
    return std::nullopt;
  }
  // What is in a folder that nobody watched yet has come there unheard.
  auto hasUnwatched = scan_.isEmpty() ? recent_.hasUnwatchedFolder(*watcher_) : true;
  if (!hasUnwatched) return fail(hasUnwatched.error());
  if (*hasUnwatched) return std::nullopt;
  auto places = recent_.placesOf(inode);
  if (!places) return fail(places.error());
  return std::move(*places);
}

Result<void> Follower::addArrived() {
  for (const std::uint64_t id : context_.learner.takeArrivedFolders()) {
    if (scan_.hasRead(id)) continue;
    if (auto added = addByID(id); !added) return added;
  }
  return {};
}

/// What was to be read changed places first: a record tells where to, by now.
Result<void> Follower::addDisturbed() {
  for (const std::uint64_t id : scan_.takeDisturbed()) {
    if (auto added = addByID(id); !added) return added;
  }
  return {};
}

Result<void> Follower::addByID(std::uint64_t folder) {
  auto row = context_.store.objectByFileID(folder);
  if (!row) return fail(row.error());
  if (!*row || !(*row)->location || (*row)->fileSystem != 0) return {};
  auto path = context_.paths.pathOf(*(*row)->location);
  if (!path) return fail(path.error());
  if (*path && context_.roots.locate(**path)) {
    scan_.add(std::move(**path), folder, TreeScan::Depth::everything);
  }
  return {};
}

/// Goes through what is to be scanned, and through what comes up with it elsewhere.
Result<void> Follower::scanArrived(const Transaction& transaction, const Pause& pause) {
  while (true) {
    if (auto scanned = scan_.run(transaction, pause); !scanned) return scanned;
    if (auto added = addArrived(); !added) return added;
    if (scan_.isEmpty()) break;
  }
  return {};
}

// Comparing everything --------------------------------------------------------------------------

Result<void> Follower::compareAll(const Transaction& transaction) {
  isInStep_ = false;
  prepareWatcher();
  for (int attempt = 0; attempt < mostComparisons; ++attempt) {
    if (auto scanned = scanAll(transaction); !scanned) return scanned;
    if (const auto& failure = scan_.watchFailure()) giveUpWatching(*failure);
    scan_.clear();
    if (!watcher_) {
      if (!scan_.takeDisturbed().empty()) continue;
      return {};
    }
    isInStep_ = true;
    auto outcome = follow(transaction);
    if (!outcome || *outcome == Outcome::lost) isInStep_ = false;
    if (!outcome) return fail(outcome.error());
    if (*outcome == Outcome::inStep && options_.hasCompared) options_.hasCompared();
    if (*outcome == Outcome::inStep) return {};
    if (const auto& failure = scan_.watchFailure()) giveUpWatching(*failure);
  }
  // Whatever had finished when this was called is in the index; of the rest nothing is known.
  return {};
}

bool Follower::isComparisonDue() const {
  // At most a twentieth of the time goes into looking.
  const auto rest =
      std::max<std::chrono::steady_clock::duration>(std::chrono::seconds(2), 20 * comparisonTook_);
  return !isInStep_ && std::chrono::steady_clock::now() - comparedAt_ > rest;
}

Result<void> Follower::scanAll(const Transaction& transaction) {
  const auto began = std::chrono::steady_clock::now();
  auto compared = compareOnce(transaction);
  // Also when it failed: whoever waits is not to try again at once.
  comparedAt_ = std::chrono::steady_clock::now();
  comparisonTook_ = comparedAt_ - began;
  if (!compared) return compared;
  foldersNeeded_ = scan_.foldersRead();
  // Only now is it known that what is missing did not turn up elsewhere.
  return settle(transaction);
}

Result<void> Follower::compareOnce(const Transaction& transaction) {
  hasLost_ = false;
  missing_.clear();
  recent_.clear();
  scan_.clear();
  looks_.clear();
  later_.clear();
  places_.clear();
  changedRoots_.clear();
  static_cast<void>(scan_.takeDisturbed());
  scan_.setWatcher(watcher_.get());
  if (watcher_) {
    // What was queued so far will be seen by the comparison.
    LookList seenAnyway;
    if (auto drained = watcher_->drain(seenAnyway); !drained) giveUpWatching(drained.error());
  }
  static_cast<void>(context_.learner.takeArrivedFolders());
  auto added = transaction([&] { return scan_.addRoots(); });
  if (added) added = scanArrived(transaction, [this] { return drainMeanwhile(); });
  return added;
}

void Follower::prepareWatcher() {
  if (watcher_ || !options_.makeWatcher) return;
  const auto now = std::chrono::steady_clock::now();
  if (refusal_ && now < retryAt_) return;
  auto made = options_.makeWatcher();
  if (made) {
    watcher_ = std::move(*made);
    return;
  }
  giveUpWatching(made.error());
}

void Follower::giveUpWatching(const Error& error) {
  const bool isNews = !refusal_;
  refusal_ = error;
  retryAt_ = std::chrono::steady_clock::now() + watchAgainAfter;
  if (watcher_) refusedKind_ = watcher_->kind();
  // Marks that do not cover everything are of no use, and others may need them.
  scan_.setWatcher(nullptr);
  watcher_.reset();
  isInStep_ = false;
  logInfo("can't watch the folders; " + error.description());
  if (!isNews || !options_.notice) return;
  const FollowStatus now = status();
  std::string text = "can't watch the folders for changes";
  if (error.isPosix(ENOSPC) && now.limits.allowed) {
    text += ": that needs " + std::to_string(now.marksNeeded) + " marks, and " +
            std::to_string(*now.limits.allowed) + " are allowed; raise \"" + now.limits.setting +
            "\" with sysctl";
  } else if (error.isPosix(EMFILE)) {
    text += ": there are as many watchers as are allowed; raise " + std::string(watcherSettings);
  } else {
    text += " (" + error.description() + ")";
  }
  options_.notice(text + "; meanwhile every question is answered by a look at all files");
}

FollowStatus Follower::status() const {
  FollowStatus status;
  status.refusal = refusal_;
  status.marksNeeded = foldersNeeded_;
  status.unreadableFolders = scan_.unreadableFolders();
  if (watcher_) {
    status.watcher = watcher_->kind();
    status.foldersWatched = watcher_->watchedFolders();
    status.refusal.reset();
  }
  const auto kind = status.watcher ? status.watcher : refusedKind_;
  status.limits = WatchLimits::of(kind.value_or(WatcherKind::folderMarks));
  return status;
}

}  // namespace mirabel
