#pragma once

#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>

#include "applibrary/LocalAppLibraryCache.h"
#include "applibrary/LocalAppLibraryManager.h"
#include "foundation/SerialQueue.h"
#include "identity/AppLibraryRoots.h"
#include "items/AppLibraryOwners.h"
#include "mirabel/Error.h"
#include "platform/EnumerationObservers.h"
#include "platform/EventStreams.h"
#include "platform/Platform.h"

namespace mirabel {

/// The app libraries of the process: both caches, and the shared manager, which starts with what
/// the working set was last fed from. One for each platform; it outlives whoever asks it for roots
/// or owners. Any thread may call it.
class MRBAppLibraryManager final : public AppLibraryRoots, public AppLibraryOwners {
 public:
  /// What `platform` refers to outlives this.
  explicit MRBAppLibraryManager(const Platform& platform);

  /// Asks the registry and writes the main cache where the answer is a new one; whether it did.
  /// This and upgrades run one at a time on the background queue, which the call waits for; from
  /// that queue, as in a call of the observer, neither may be asked for.
  bool refreshFromRegistry();
  /// Has the shared manager follow the main cache; whether it changed.
  bool upgradeFromMainCache(VesselChangeObserver* observer = nullptr);

  /// Has the history follow the libraries of the shared manager, under the names that the registry
  /// had for them at the last refresh. A failure is logged.
  void followLibraries(EventStreams& events);
  /// Whether both the last refresh and the last following succeeded, or else it is time to try
  /// again after a while.
  [[nodiscard]] bool isInStep() const { return !failure(); }
  /// Why not.
  [[nodiscard]] std::optional<Error> failure() const;

  [[nodiscard]] LocalAppLibraryManager& shared() { return shared_; }
  [[nodiscard]] AppLibraryCaches& caches() { return caches_; }

  [[nodiscard]] List rootURLsForAppLibraries() const override {
    return shared_.rootURLsForAppLibraries();
  }
  [[nodiscard]] std::vector<URL> folders() const override { return shared_.folders(); }
  [[nodiscard]] std::optional<BundleProxy> applicationOwning(const URL& url) const override {
    return shared_.applicationOwning(url);
  }

 private:
  bool inBackground(const std::function<bool()>& work);
  void note(std::optional<Error>& failure, const std::optional<Error>& outcome);

  Platform platform_;
  AppLibraryCaches caches_;
  LocalAppLibraryManager shared_;
  // What the registry told last; on the background queue.
  bool hasLibraries_ = true;
  std::map<std::string, std::string> latestNames_;  // by path of the container
  mutable std::mutex mutex_;  // of the failures: who asks for them does not wait for the queue
  std::optional<Error> refreshFailure_;
  std::optional<Error> followFailure_;
  SerialQueue backgroundQueue_{"mirabel.app-library.background"};
};

}  // namespace mirabel
