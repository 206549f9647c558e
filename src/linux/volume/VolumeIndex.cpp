#include "linux/volume/VolumeIndex.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <mutex>
#include <type_traits>
#include <utility>

#include "foundation/Log.h"
#include "foundation/LookFailure.h"
#include "linux/kernel/LongPath.h"
#include "linux/volume/FollowThread.h"
#include "linux/volume/Follower.h"
#include "linux/volume/Learner.h"
#include "linux/volume/LongGone.h"
#include "linux/volume/Reserve.h"
#include "linux/volume/VolumeState.h"
#include "linux/volume/VolumeUUID.h"

namespace mirabel {
namespace {

Error onAnotherVolume(const MonitoredRoots& roots) {
  return Error::posix(EMEDIUMTYPE, "the document storage \"" + roots.firstPath() +
                                       "\" has come to lie on another volume, which has identities "
                                       "of its own; ask again");
}

class StoredVolumeIndex final : public VolumeIndex {
 public:
  StoredVolumeIndex(std::unique_ptr<VolumeState> state, MonitoredRoots& roots, std::uint64_t device,
                    const Options& options)
      : state_(std::move(state)),
        roots_(roots),
        paths_(state_->store(), roots, device),
        recorder_(state_->store(), state_->journal(), paths_, roots, options.isPackageName),
        learner_(state_->store(), state_->allocator(), recorder_, roots, device,
                 options.isPackageName),
        follower_(
            {learner_, state_->store(), recorder_, paths_, roots, device, options.isPackageName},
            {options.makeWatcher, [this] { return changedRoots(); },
             [this] { state_->releaseMemory(); }, options.notice}),
        followsInBackground_(options.followsInBackground && options.makeWatcher),
        device_(device),
        tellBroken_(options.broken),
        isPackageName_(options.isPackageName) {
    learner_.setRecentPlaces(&follower_);
    reserve_.make();
  }

  ~StoredVolumeIndex() override { thread_.reset(); }

  Result<void> loadFollowedFolders() {
    if (auto loaded = followed_.load(); !loaded) return loaded;
    roots_.setFurther(followed_.paths());
    return {};
  }

  Result<void> forgetLongGone() {
    forgotAt_ = std::chrono::steady_clock::now();
    return inTransaction([&] {
      return mirabel::forgetLongGone(state_->database(), state_->store(), state_->allocator(),
                                     std::chrono::system_clock::now(), Retention{}.age);
    });
  }

  Result<void> loadKeptAttributes() {
    return keptAttributes_.load([this](std::uint64_t fileID) -> Result<bool> {
      auto row = state_->store().objectByFileID(fileID);
      if (!row) return fail(row.error());
      return row->has_value();
    });
  }

  Result<std::uint64_t> learn(const std::string& folderPath, int folder,
                              std::span<Sighting> sightings) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    const std::string path = plainPath(folderPath);
    return answeredInTransaction([&] { return learner_.learn(path, folder, sightings); });
  }

  Result<Sighting> learnPath(const std::string& path, const ObjectStatus& status,
                             bool isPackage) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    return answeredInTransaction(
        [&] { return learner_.learnPath(plainPath(path), status, isPackage); });
  }

  Result<void> learnPaths(std::span<const std::string> paths) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    return inTransactionAtLast([&]() -> Result<void> {
      for (const std::string& path : paths) {
        const std::string plain = plainPath(path);
        const auto status = statusOf(plain);
        if (!status && saysOutOfReach(status.error())) continue;
        if (!status) return fail(status.error());
        const bool isPackage =
            status->kind == FileKind::folder && isPackageName_(splitPath(plain).name);
        auto learned = learner_.learnPath(plain, *status, isPackage);
        if (!learned && !isDisturbance(learned.error())) return fail(learned.error());
      }
      return {};
    });
  }

  Result<std::string> pathOfFileID(std::uint64_t fileID) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    std::optional<std::string> path;
    // Where changes are heard of, what has not happened to it need not be searched for.
    auto done = follower_.isInStep() ? stand(fileID, path) : Result<void>();
    if (done && !path && follower_.isInStep()) done = follower_.catchUp(transactions());
    if (!done) return fail(done.error());
    if (path) return std::move(*path);
    auto found = answeredInTransaction([&] { return learner_.find(fileID); });
    if (!found) return fail(found.error());
    if (!*found) return fail(Error::posix(ENOENT));
    return std::move(**found);
  }

  Result<std::vector<std::string>> pathsOfFileID(std::uint64_t fileID) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    return answeredInTransaction([&]() -> Result<std::vector<std::string>> {
      auto row = state_->store().objectByFileID(fileID);
      if (!row) return fail(row.error());
      if (!*row) return {};
      auto standing = paths_.standingPaths(**row);
      if (!standing || !standing->empty()) return standing;
      auto found = learner_.find(fileID);
      if (!found) return fail(found.error());
      if (*found) standing->push_back(std::move(**found));
      return standing;
    });
  }

  Result<std::uint64_t> fileIDOfDocument(std::uint32_t documentID) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    auto done = follower_.isInStep() ? follower_.catchUp(transactions()) : Result<void>();
    if (!done) return fail(done.error());
    auto holder = answeredInTransaction([&] { return learner_.holderOf(documentID); });
    if (!holder) return fail(holder.error());
    if (!*holder) return fail(Error::posix(ENOENT));
    return **holder;
  }

  Result<void> reconcile() override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    return follower_.compareAll(transactions());
  }

  Result<std::uint64_t> currentEventID() override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    if (auto done = follower_.catchUp(transactions()); !done) return fail(done.error());
    auto begun = inTransaction([&]() -> Result<void> {
      if (auto active = state_->journal().activate(); !active) return active;
      return state_->journal().prune(Retention{});
    });
    if (!begun) return fail(begun.error());
    if (std::chrono::steady_clock::now() - forgotAt_ > std::chrono::days(1)) {
      if (auto forgotten = forgetLongGone(); !forgotten) return fail(forgotten.error());
    }
    if (followsInBackground_ && !thread_) startThread();
    return state_->journal().lastID();
  }

  Result<std::vector<JournalRecord>> events(std::uint64_t since, std::size_t limit) override {
    const std::scoped_lock lock(mutex_);
    if (left_) return fail(*left_);
    if (!state_->journal().canReplay(since)) return fail(Error::posix(ESTALE));
    return state_->journal().replay(since, limit);
  }

  Result<void> follow(const std::vector<FollowedFolder>& folders, std::uint64_t version) override {
    const Ringing ringing(*this);
    const std::scoped_lock lock(mutex_);
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    const auto difference = followed_.differenceTo(folders, version);
    if (difference.isEmpty()) return {};
    const std::uint64_t lastEvent = state_->journal().lastID();
    // Those that go are told of in the transaction that forgets them; those that come are scanned
    // by whoever brings the index in step next, in another process if need be.
    auto done = inTransaction([&]() -> Result<void> {
      for (const std::string& path : difference.gone) {
        if (auto left = leaveRoot(path); !left) return left;
      }
      for (const std::string& path : difference.come) {
        if (auto left = learner_.leaveOutside(path); !left) return left;
      }
      for (const std::string& path : difference.relabelled) {
        if (auto told = tellOfRoot(path); !told) return told;
      }
      return followed_.store(folders, version, lastEvent);
    });
    if (!done) return done;
    followed_.adopt(folders, version, lastEvent);
    roots_.setFurther(followed_.paths());
    follower_.addRoots(difference.come);
    return follower_.isInStep() ? follower_.catchUp(transactions()) : Result<void>();
  }

  std::uint64_t lastEventUnder(std::uint64_t version) override {
    const std::scoped_lock lock(mutex_);
    return followed_.lastEventUnder(version);
  }

  JournalBell& bell() override { return bell_; }
  KeptAttributes& keptAttributes() override { return keptAttributes_; }

  Status status() override {
    const std::scoped_lock lock(mutex_);
    Status status{follower_.status()};
    status.isUsable = stayOnVolume() && !state_->isBroken();
    if (!state_->journal().isActive()) return status;
    status.firstEventID = state_->journal().firstID();
    status.lastEventID = state_->journal().lastID();
    return status;
  }

  std::uint64_t commits() const override { return commits_; }
  void releaseMemory() override {
    const std::scoped_lock lock(mutex_);
    state_->releaseMemory();
  }

  UUID historyUUID() const override { return state_->history(); }
  const StateFolder& stateFolder() const override { return state_->folder(); }

  std::uint32_t device() const override {
    const auto folded = static_cast<std::uint32_t>(device_ ^ (device_ >> 32));
    return folded == 0 ? 1 : folded;
  }

 private:
  /// Rings the bell when a call is over and its lock is free.
  class Ringing {
   public:
    explicit Ringing(StoredVolumeIndex& index) : index_(index) {}
    ~Ringing() { index_.bell_.ring(index_.lastEventID_); }
    Ringing(const Ringing&) = delete;
    Ringing& operator=(const Ringing&) = delete;

   private:
    StoredVolumeIndex& index_;
  };

  Result<void> inTransaction(const std::function<Result<void>()>& work) {
    auto done = state_->transaction(work);
    lastEventID_ = state_->journal().lastID();
    commits_ = state_->commits();
    return done;
  }

  /// For what has to be written before something can be deleted, and may be done twice.
  Result<void> inTransactionAtLast(const std::function<Result<void>()>& work) {
    auto done = inTransaction(work);
    if (done || !reserve_.releaseAfter(done.error())) return done;
    return inTransaction(work);
  }

  /// The same, for what has an answer.
  template <class Work>
  std::invoke_result_t<Work> answeredInTransaction(const Work& work) {
    std::invoke_result_t<Work> answer = fail(Error::posix(ENOENT));
    auto done = inTransactionAtLast([&]() -> Result<void> {
      answer = work();
      return answer ? Result<void>() : fail(answer.error());
    });
    if (!done) return fail(done.error());
    return answer;
  }

  Transaction transactions() {
    return [this](const std::function<Result<void>()>& work) { return inTransaction(work); };
  }

  Result<MonitoredRoots::Changes> changedRoots() {
    auto changes = roots_.refresh();
    if (auto known = roots_.volume(); !known) return fail(known.error());
    if (auto stays = stayOnVolume(); !stays) return fail(stays.error());
    return changes;
  }

  /// Identities are those of one volume. Once the document storage was seen on another one, nothing
  /// is answered any more, also when it has come back: what happened meanwhile was not heard of.
  Result<void> stayOnVolume() {
    if (left_) return fail(*left_);
    if (auto usable = state_->stayUsable(); !usable) return usable;
    if (!roots_.hasLeftVolume()) return {};
    left_ = onAnotherVolume(roots_);
    logError("the volume's state can't be used any more; " + left_->description());
    if (tellBroken_) tellBroken_(left_->userInfo.find(errorkey::detail)->second);
    return fail(*left_);
  }

  void startThread() {
    thread_ = std::make_unique<FollowThread>(
        FollowThread::Work{[this] {
                             const std::scoped_lock lock(mutex_);
                             return follower_.watcher();
                           },
                           [this] {
                             const Ringing ringing(*this);
                             const std::scoped_lock lock(mutex_);
                             if (!stayOnVolume()) return;
                             tellFailure(follower_.catchUp(transactions()));
                           },
                           [this] { return isDue(); }});
  }

  /// Once for as long as it stays the same: documents may be closed for days.
  void tellFailure(const Result<void>& followed) {
    const std::string failure = followed ? "" : followed.error().description();
    if (failure != lastFailure_ && !followed) logError("can't follow changes; " + failure);
    lastFailure_ = failure;
  }

  /// Whether whoever waits for changes has to be told by a look at everything.
  bool isDue() {
    if (!bell_.hasListeners()) return false;
    const std::scoped_lock lock(mutex_);
    return follower_.isComparisonDue() || follower_.isInStep();
  }

  Result<void> stand(std::uint64_t fileID, std::optional<std::string>& path) {
    auto standing = learner_.standingPath(fileID);
    if (!standing) return fail(standing.error());
    path = std::move(*standing);
    return {};
  }

  Result<void> leaveRoot(const std::string& path) {
    auto row = state_->store().objectAt(0, path);
    if (!row || !*row) return row ? Result<void>() : fail(row.error());
    return learner_.leave(std::move(**row));
  }

  Result<void> tellOfRoot(const std::string& path) {
    auto row = state_->store().objectAt(0, path);
    if (!row || !*row) return row ? Result<void>() : fail(row.error());
    return recorder_.changed(**row, {0, path});
  }

  // Names are kept by their place, so each place must have one path. Below a root no component is
  // a symbolic link, or the folder would not have been opened.
  std::string plainPath(const std::string& path) const {
    return roots_.locate(path) ? withoutDots(path) : path;
  }

  std::mutex mutex_;
  std::unique_ptr<VolumeState> state_;
  Reserve reserve_{state_->folder()};
  MonitoredRoots& roots_;
  FollowedFolders followed_{state_->database()};
  IndexedPaths paths_;
  ChangeRecorder recorder_;
  Learner learner_;
  Follower follower_;
  bool followsInBackground_;
  std::uint64_t device_;
  std::function<void(std::string_view)> tellBroken_;
  std::optional<Error> left_;  // the volume
  std::function<bool(std::string_view)> isPackageName_;
  JournalBell bell_;
  KeptAttributes keptAttributes_{[this](const auto& work) {
    const std::scoped_lock lock(mutex_);
    return inTransactionAtLast([&] { return work(state_->database()); });
  }};
  std::atomic<std::uint64_t> lastEventID_ = 0;
  std::atomic<std::uint64_t> commits_ = 0;
  std::chrono::steady_clock::time_point forgotAt_{};
  std::string lastFailure_;  // of the thread
  std::unique_ptr<FollowThread> thread_;
};

Result<std::unique_ptr<VolumeIndex>> openOnce(MonitoredRoots& roots,
                                              const VolumeIndex::Options& options) {
  auto status = statusOf(options.volumePath);
  if (!status) return fail(status.error());
  auto uuid = volumeUUID(options.volumePath);
  if (!uuid) return fail(uuid.error());
  auto folder = StateFolder::acquire(options.stateFolder, *uuid, options.timeout, options.notice);
  if (!folder) return fail(folder.error());
  auto state = VolumeState::open(std::move(*folder), options.notice, options.broken);
  if (!state) return fail(state.error());
  auto index =
      std::make_unique<StoredVolumeIndex>(std::move(*state), roots, status->device, options);
  // Something may have been mounted since it was looked at.
  const auto volume = roots.volume();
  if (!volume) return fail(volume.error());
  if (*volume != status->device || roots.hasLeftVolume()) return fail(onAnotherVolume(roots));
  auto loaded = index->forgetLongGone();
  if (loaded) loaded = index->loadKeptAttributes();
  if (loaded) loaded = index->loadFollowedFolders();
  if (!loaded) return fail(loaded.error());
  return index;
}

}  // namespace

Result<std::unique_ptr<VolumeIndex>> VolumeIndex::open(MonitoredRoots& roots, Options options) {
  // Every change that is written down would be one more.
  if (roots.locate(options.stateFolder)) {
    return fail(Error::posix(EINVAL, "the state folder \"" + options.stateFolder +
                                         "\" lies in the documents that it is to tell of"));
  }
  if (!options.isPackageName) options.isPackageName = [](std::string_view) { return false; };
  auto index = openOnce(roots, options);
  // Whoever meets damage leaves word for the next one, which sets the database aside.
  if (!index && index.error().domain == ErrorDomain::store) index = openOnce(roots, options);
  return index;
}

}  // namespace mirabel
