#include "host/ContainerWatches.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <utility>

#include "foundation/Log.h"
#include "foundation/URL.h"
#include "host/LocalContainer.h"
#include "linux/files/LinuxVesselManager.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {

/// A container with those who watch it. Its members are used by one thread at a time: the one that
/// adds the first watcher, and then that of the watches.
class ContainerWatches::Watched {
 public:
  static Result<std::shared_ptr<Watched>> open(HostedProvider& provider,
                                               const std::string& identifier) {
    auto watched = std::make_shared<Watched>(provider, identifier);
    if (auto listening = watched->listen(); !listening) return fail(listening.error());
    // Taken when the notifier exists: that tells of everything since then.
    auto container = LocalContainer::open(provider, identifier);
    if (!container) return fail(container.error());
    auto anchor = (*container)->currentSyncAnchor();
    if (!anchor) return fail(anchor.error());
    watched->container_ = *std::move(container);
    watched->anchor_ = *std::move(anchor);
    return watched;
  }
  Watched(HostedProvider& provider, std::string identifier)
      : provider_(provider), identifier_(std::move(identifier)) {}
  ~Watched() {
    if (signaller_) signaller_->invalidate();
  }

  /// Whether something is there that the watchers have not been woken for.
  bool hasNews(bool isAsked) {
    const bool isThere = listen().has_value();
    // That it is gone, or back, is told once.
    if (std::exchange(wasThere_, isThere) != isThere) return true;
    return isThere && isAsked && hasChanges();
  }

  std::vector<std::shared_ptr<Watcher>> watchers;  ///< guarded by the mutex of the watches

 private:
  /// Has whatever happens in the container signalled from now on, also after it was moved.
  Result<void> listen();
  void followLibraries();
  bool hasChanges();

  HostedProvider& provider_;
  std::string identifier_;
  std::optional<URL> place_;
  std::shared_ptr<VesselEnumerator> signaller_;
  std::uint64_t librariesVersion_ = 0;  ///< that the signaller listens to, or an earlier one
  std::unique_ptr<LocalContainer> container_;
  Data anchor_;
  bool wasThere_ = true;
};

Result<void> ContainerWatches::Watched::listen() {
  auto place = LocalContainer::placeOf(provider_, identifier_);
  if (!place) return fail(place.error());
  if (signaller_ && *place == place_) {
    followLibraries();
    return {};
  }
  // The working set has no notifier of its own; that of all folders looks at the same places.
  const bool isWorkingSet = identifier_ == VesselWorkingSetContainerItemIdentifier;
  librariesVersion_ = provider_.libraries().shared().versionToken();
  auto signaller = provider_.vessel().enumeratorForContainerItemIdentifier(
      isWorkingSet ? std::string(VesselAllDirectoriesContainerItemIdentifier) : identifier_,
      LiveUpdates::wanted);
  if (!signaller) return fail(signaller.error());
  if (signaller_) signaller_->invalidate();
  signaller_ = *std::move(signaller);
  place_ = *std::move(place);
  return {};
}

/// Has what happens in app libraries that came meanwhile signalled too. The signaller is never
/// asked for changes, which would have it take over the new list; but an anchor is always one of
/// the list of now.
void ContainerWatches::Watched::followLibraries() {
  const std::uint64_t version = provider_.libraries().shared().versionToken();
  if (version == librariesVersion_) return;
  librariesVersion_ = version;
  signaller_->currentSyncAnchor([](const std::optional<Data>&) {});
}

bool ContainerWatches::Watched::hasChanges() {
  bool hasAny = false;
  for (bool more = true; more;) {
    const auto batch = container_->changes(anchor_);
    if (!batch) {
      // Whoever asks for the changes hears of it too, and knows what to do.
      if (auto anchor = container_->currentSyncAnchor()) anchor_ = *std::move(anchor);
      return true;
    }
    hasAny |= !batch->updated.empty() || !batch->deleted.empty();
    anchor_ = batch->anchor;
    more = batch->moreComing;
  }
  return hasAny;
}

/// Ends with the client's handle on it.
class ContainerWatches::Entry final : public ContainerWatch {
 public:
  Entry(ContainerWatches& watches, std::shared_ptr<Watcher> watcher)
      : watches_(watches), watcher_(std::move(watcher)) {}
  ~Entry() override { watches_.remove(watcher_); }
  Entry(const Entry&) = delete;
  Entry& operator=(const Entry&) = delete;

 private:
  ContainerWatches& watches_;
  std::shared_ptr<Watcher> watcher_;
};

ContainerWatches::ContainerWatches(HostedProvider& provider, std::chrono::milliseconds interval)
    : provider_(provider), interval_(interval) {
  provider_.linuxPlatform().manager().setSignalListener(
      [bell = bell_](std::string_view, const VesselManager::SignalHandler& done) {
        {
          const std::lock_guard lock(bell->mutex);
          bell->isSignalled = true;
        }
        bell->rung.notify_one();
        done(std::nullopt);
      });
  thread_ = std::thread([this] { run(); });
}

ContainerWatches::~ContainerWatches() {
  provider_.linuxPlatform().manager().setSignalListener({});
  {
    const std::lock_guard lock(bell_->mutex);
    bell_->mustEnd = true;
  }
  bell_->rung.notify_one();
  thread_.join();
}

Result<std::unique_ptr<ContainerWatch>> ContainerWatches::add(const std::string& identifier,
                                                              std::function<void()> changed,
                                                              Wake wake) {
  // What others watch may have gone since.
  if (auto place = LocalContainer::placeOf(provider_, identifier); !place)
    return fail(place.error());
  auto watcher = std::make_shared<Watcher>(std::move(changed));
  std::unique_ptr<ContainerWatch> entry = std::make_unique<Entry>(*this, watcher);
  {
    const std::lock_guard lock(mutex_);
    if (const auto found = watched_.find({identifier, wake}); found != watched_.end()) {
      found->second->watchers.push_back(std::move(watcher));
      return entry;
    }
  }
  // Without the lock, for a signal that comes of it takes that.
  auto watched = Watched::open(provider_, identifier);
  if (!watched) return fail(watched.error());
  const std::lock_guard lock(mutex_);
  const auto place = watched_.try_emplace({identifier, wake}, *std::move(watched)).first;
  place->second->watchers.push_back(std::move(watcher));
  return entry;
}

void ContainerWatches::remove(const std::shared_ptr<Watcher>& watcher) {
  watcher->end();
  std::shared_ptr<Watched> unwatched;  // let go of without the lock
  const std::lock_guard lock(mutex_);
  for (auto& [key, watched] : watched_) {
    if (std::erase(watched->watchers, watcher) == 0) continue;
    if (watched->watchers.empty()) {
      unwatched = watched;
      watched_.erase(key);
    }
    return;
  }
}

void ContainerWatches::run() {
  std::uint64_t checkedUpTo = 0;
  for (std::unique_lock lock(bell_->mutex); !bell_->mustEnd;) {
    const bool wasSignalled = bell_->rung.wait_for(
        lock, interval_, [this] { return bell_->isSignalled || bell_->mustEnd; });
    if (bell_->mustEnd) return;
    bell_->isSignalled = false;
    lock.unlock();
    const auto now = provider_.linuxPlatform().index().status();
    const std::uint64_t last = now.lastEventID;
    // Of an index that can't be used any more no signal comes; who watches is told why.
    if (wasSignalled || last != checkedUpTo || !now.isUsable) check();
    checkedUpTo = last;
    lock.lock();
  }
}

void ContainerWatches::check() {
  std::vector<std::pair<Wake, std::shared_ptr<Watched>>> all;
  {
    const std::lock_guard lock(mutex_);
    for (const auto& [key, watched] : watched_)
      all.emplace_back(key.second, watched);
  }
  for (const auto& [wake, watched] : all) {
    // What nobody waits for the changes of is not asked for them.
    const bool hasNews = watched->hasNews(wake == Wake::forChanges);
    if (!hasNews && wake == Wake::forChanges) continue;
    // Who watches now: the question may have taken in what came after somebody's first anchor.
    std::vector<std::shared_ptr<Watcher>> watchers;
    {
      const std::lock_guard lock(mutex_);
      watchers = watched->watchers;
    }
    for (const auto& watcher : watchers)
      watcher->wake();
  }
}

}  // namespace mirabel
