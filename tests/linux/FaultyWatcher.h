#pragma once

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <utility>

#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// What a watcher is made to fail at.
struct WatcherFaults {
  std::size_t marks = 1'000'000;  ///< how many there are
  bool loses = false;             ///< the next reading finds that records were dropped
  int made = 0;                   ///< answered: watchers so far
  /// Called around each watch that is added.
  std::function<void()> beforeWatch{}, afterWatch{};
};

/// A real watcher that can be made to lose records, or to have no more marks.
class FaultyWatcher final : public FolderWatcher {
 public:
  FaultyWatcher(std::unique_ptr<FolderWatcher> real, std::shared_ptr<WatcherFaults> faults)
      : real_(std::move(real)), faults_(std::move(faults)) {
    ++faults_->made;
  }

  Result<void> watch(int folder, std::uint64_t id) override {
    if (real_->watchedFolders() >= faults_->marks && !real_->isWatched(id)) {
      return fail(Error::posix(ENOSPC));
    }
    if (faults_->beforeWatch) faults_->beforeWatch();
    auto watched = real_->watch(folder, id);
    if (faults_->afterWatch) faults_->afterWatch();
    return watched;
  }
  void forget(std::uint64_t id) override { real_->forget(id); }
  bool isWatched(std::uint64_t id) const override { return real_->isWatched(id); }
  std::size_t watchedFolders() const override { return real_->watchedFolders(); }
  Result<Drained> drain(LookList& looks) override {
    if (!std::exchange(faults_->loses, false)) return real_->drain(looks);
    LookList lost;
    auto drained = real_->drain(lost);
    if (drained) drained->hasLost = true;
    return drained;
  }
  int descriptor() const override { return real_->descriptor(); }
  WatcherKind kind() const override { return real_->kind(); }

 private:
  std::unique_ptr<FolderWatcher> real_;
  std::shared_ptr<WatcherFaults> faults_;
};

inline Result<std::unique_ptr<FolderWatcher>> makeFaultyWatcher(
    Result<std::unique_ptr<FolderWatcher>> real, std::shared_ptr<WatcherFaults> faults) {
  if (!real) return real;
  return std::make_unique<FaultyWatcher>(std::move(*real), std::move(faults));
}

}  // namespace mirabel
