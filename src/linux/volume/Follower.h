#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "linux/kernel/MountTable.h"
#include "linux/volume/FollowStatus.h"
#include "linux/volume/IndexContext.h"
#include "linux/volume/MissingNames.h"
#include "linux/volume/PlaceLooks.h"
#include "linux/volume/RecentNames.h"
#include "linux/volume/TreeScan.h"
#include "linux/watch/FolderWatcher.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Keeps the index in step with everything below the roots: compares all of it with the disk once,
/// hears of changes from the kernel from then on, and compares all of it again whenever something
/// may have been missed. Where folders can't be watched it compares every time. What it finds
/// becomes events. Used under the lock of the index.
class Follower final : public RecentPlaces {
 public:
  struct Options {
    /// Makes the watcher; nothing: no folder is watched.
    std::function<Result<std::unique_ptr<FolderWatcher>>()> makeWatcher;
    /// Says which roots are other folders than they were, which no record tells of; after an error
    /// nothing is taken in.
    std::function<Result<MonitoredRoots::Changes>()> changedRoots;
    /// Called when everything was compared and changes are heard of from now on.
    std::function<void()> hasCompared;
    /// Told, once, when folders can't be watched.
    std::function<void(std::string_view)> notice;
  };
  Follower(IndexContext context, Options options);

  /// Brings the index in step: when it returns without an error, whatever a finished system call
  /// had changed before is in it. After an error everything is compared next time.
  [[nodiscard]] Result<void> catchUp(const Transaction& transaction);
  /// Compares everything, whatever is known.
  [[nodiscard]] Result<void> compareAll(const Transaction& transaction);

  /// These roots were added; what lies in them is taken in by the next `catchUp`.
  void addRoots(const std::vector<std::string>& paths);

  /// Whether changes are heard of, so that the index need not be compared.
  [[nodiscard]] bool isInStep() const override { return isInStep_; }
  /// Whether changes are not heard of, and the last look at everything was long enough ago for
  /// those who wait to be worth another.
  [[nodiscard]] bool isComparisonDue() const;
  /// Readable when there is something to catch up with; null when nothing is watched.
  [[nodiscard]] std::shared_ptr<FolderWatcher> watcher() const { return watcher_; }
  [[nodiscard]] FollowStatus status() const;

  [[nodiscard]] Result<std::optional<std::vector<RecentPlace>>> placesOf(
      std::uint64_t inode) override;

 private:
  enum class Outcome { inStep, lost };
  [[nodiscard]] Result<Outcome> follow(const Transaction& transaction);
  [[nodiscard]] Result<void> followRound(const Transaction& transaction, const Pause& pause,
                                         LookList::Folders looks);
  [[nodiscard]] Result<void> lookAndScan(const Transaction& transaction, const Pause& pause,
                                         LookList::Folders looks);
  [[nodiscard]] Result<void> settle(const Transaction& transaction);
  [[nodiscard]] Result<bool> drain();
  [[nodiscard]] Result<void> drainMeanwhile();
  [[nodiscard]] Result<void> scanArrived(const Transaction& transaction, const Pause& pause);
  [[nodiscard]] Result<void> addArrived();
  [[nodiscard]] Result<void> addDisturbed();
  [[nodiscard]] Result<void> addChangedRoots(const Transaction& transaction);
  [[nodiscard]] Result<void> addByID(std::uint64_t folder);
  [[nodiscard]] Result<void> scanAll(const Transaction& transaction);
  [[nodiscard]] Result<void> compareOnce(const Transaction& transaction);
  void prepareWatcher();
  void giveUpWatching(const Error& error);

  IndexContext context_;
  Options options_;
  MissingNames missing_;
  TreeScan scan_;
  PlaceLooks places_;
  RecentNames recent_;
  LookList looks_;
  std::set<std::string> changedRoots_;
  LookList later_;  // places whose folder was not where the index has it
  std::shared_ptr<FolderWatcher> watcher_;
  MountTable mounts_;
  bool isInStep_ = false;
  bool hasLost_ = false;  // records, since the last full comparison began
  std::optional<Error> refusal_;
  std::optional<WatcherKind> refusedKind_;
  std::chrono::steady_clock::time_point retryAt_{};
  std::chrono::steady_clock::time_point comparedAt_{};
  std::chrono::steady_clock::duration comparisonTook_{};
  std::size_t foldersNeeded_ = 0;
};

}  // namespace mirabel
