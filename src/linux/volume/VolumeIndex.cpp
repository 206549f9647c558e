#include "linux/volume/VolumeIndex.h"

#include <cerrno>
#include <fcntl.h>
#include <mutex>
#include <utility>

#include "linux/kernel/LongPath.h"
#include "linux/volume/Learner.h"
#include "linux/volume/Reconciler.h"
#include "linux/volume/VolumeState.h"
#include "linux/volume/VolumeUUID.h"

namespace mirabel {
namespace {

// Enough for weeks of work on a home; an anchor from before starts over.
constexpr std::uint64_t eventsKept = 1'000'000;

class StoredVolumeIndex final : public VolumeIndex {
 public:
  StoredVolumeIndex(std::unique_ptr<VolumeState> state, const MonitoredRoots& roots,
                    std::uint64_t device,
                    const std::function<bool(std::string_view)>& isPackageName)
      : state_(std::move(state)),
        roots_(roots),
        paths_(state_->store(), roots, device),
        recorder_(state_->store(), state_->journal(), paths_, roots, isPackageName),
        learner_(state_->store(), state_->allocator(), recorder_, roots, device, isPackageName),
        reconciler_(learner_, state_->store(), recorder_, roots, device, isPackageName),
        device_(device) {}

  Result<void> learn(const std::string& folderPath, int folder,
                     std::span<Sighting> sightings) override {
    const std::scoped_lock lock(mutex_);
    const std::string path = plainPath(folderPath);
    return state_->transaction([&] { return learner_.learn(path, folder, sightings); });
  }

  Result<Sighting> learnPath(const std::string& path, const ObjectStatus& status,
                             bool isPackage) override {
    const std::scoped_lock lock(mutex_);
    Result<Sighting> answer = fail(Error::posix(ENOENT));
    auto done = state_->transaction([&]() -> Result<void> {
      answer = learner_.learnPath(plainPath(path), status, isPackage);
      if (!answer) return fail(answer.error());
      return {};
    });
    if (!done) return fail(done.error());
    return answer;
  }

  Result<std::string> pathOfFileID(std::uint64_t fileID) override {
    const std::scoped_lock lock(mutex_);
    std::optional<std::string> path;
    auto done = state_->transaction([&]() -> Result<void> { return find(fileID, path); });
    if (!done) return fail(done.error());
    if (!path) return fail(Error::posix(ENOENT));
    return std::move(*path);
  }

  Result<std::uint64_t> fileIDOfDocument(std::uint32_t documentID) override {
    const std::scoped_lock lock(mutex_);
    std::optional<std::uint64_t> fileID;
    auto done = state_->transaction([&]() -> Result<void> {
      auto holder = learner_.holderOf(documentID);
      if (!holder) return fail(holder.error());
      fileID = *holder;
      return {};
    });
    if (!done) return fail(done.error());
    if (!fileID) return fail(Error::posix(ENOENT));
    return *fileID;
  }

  Result<void> reconcile() override {
    const std::scoped_lock lock(mutex_);
    return reconcileLocked();
  }

  Result<std::uint64_t> currentEventID() override {
    const std::scoped_lock lock(mutex_);
    if (auto done = reconcileLocked(); !done) return fail(done.error());
    auto begun = state_->transaction([&]() -> Result<void> {
      if (auto active = state_->journal().activate(); !active) return active;
      return state_->journal().prune(eventsKept);
    });
    if (!begun) return fail(begun.error());
    return state_->journal().lastID();
  }

  Result<std::vector<JournalRecord>> events(std::uint64_t since, std::size_t limit) override {
    const std::scoped_lock lock(mutex_);
    if (!state_->journal().canReplay(since)) return fail(Error::posix(ESTALE));
    return state_->journal().replay(since, limit);
  }

  UUID historyUUID() const override { return state_->history(); }

  std::uint32_t device() const override {
    const auto folded = static_cast<std::uint32_t>(device_ ^ (device_ >> 32));
    return folded == 0 ? 1 : folded;
  }

 private:
  Result<void> reconcileLocked() {
    return reconciler_.run([&](const auto& work) { return state_->transaction(work); });
  }

  Result<void> find(std::uint64_t fileID, std::optional<std::string>& path) {
    auto found = learner_.find(fileID);
    if (!found) return fail(found.error());
    path = std::move(*found);
    return {};
  }

  // Names are kept by their place, so each place must have one path. Below a root no component is
  // a symbolic link, or the folder would not have been opened.
  std::string plainPath(const std::string& path) const {
    return roots_.locate(path) ? withoutDots(path) : path;
  }

  std::mutex mutex_;
  std::unique_ptr<VolumeState> state_;
  const MonitoredRoots& roots_;
  IndexedPaths paths_;
  ChangeRecorder recorder_;
  Learner learner_;
  Reconciler reconciler_;
  std::uint64_t device_;
};

}  // namespace

Result<std::unique_ptr<VolumeIndex>> VolumeIndex::open(const MonitoredRoots& roots,
                                                       Options options) {
  auto status = statusOf(options.volumePath);
  if (!status) return fail(status.error());
  auto uuid = volumeUUID(options.volumePath);
  if (!uuid) return fail(uuid.error());
  auto folder = StateFolder::acquire(options.stateFolder, *uuid, options.timeout, options.notice);
  if (!folder) return fail(folder.error());
  auto state = VolumeState::open(std::move(*folder), options.notice);
  if (!state) return fail(state.error());
  if (!options.isPackageName) options.isPackageName = [](std::string_view) { return false; };
  return std::make_unique<StoredVolumeIndex>(std::move(*state), roots, status->device,
                                             options.isPackageName);
}

}  // namespace mirabel
