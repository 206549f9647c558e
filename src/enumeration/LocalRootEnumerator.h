#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "applibrary/LocalAppLibraryManager.h"
#include "applibrary/MRBAppLibraryManager.h"
#include "enumeration/EnumerationServices.h"
#include "enumeration/LocalFileEnumerator.h"
#include "foundation/SerialQueue.h"
#include "fs/FSChangeToken.h"
#include "fs/RunningReaders.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// Serves the containers that are made of several folders: the root and the working set, which
/// hold the app libraries besides files, and all directories. It tells the files through a
/// `LocalFileEnumerator`, and carries in every anchor the version of the list of app libraries that
/// it was told with, so that the host hears of libraries that came or went since.
///
/// An anchor whose version is not the one that this enumerator holds can't be bridged: it is
/// refused, and the host lists the container again. All directories holds no app libraries, only
/// what lies in them, and has no such case: what came or went is told by the event history.
///
/// A page cursor of the recursive containers goes with the version too: the libraries are walked in
/// the order of their list.
class LocalRootEnumerator final : public VesselEnumerator {
 public:
  /// Its own manager starts with the working-set cache for the working set, where the versions
  /// that hosts were told of last are kept, and else with the main cache. `libraries` outlives it.
  [[nodiscard]] static std::shared_ptr<LocalRootEnumerator> create(
      const EnumerationServices& services, MRBAppLibraryManager& libraries, std::string container,
      LiveUpdates liveUpdates, RunningReaders& liveReaders);

  void enumerateItems(VesselEnumerationObserver& observer, const Data& page) override;
  void enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                        const Data& anchor) override;
  void currentSyncAnchor(
      const std::function<void(std::optional<Data>)>& completionHandler) override;
  void invalidate() override;

  [[nodiscard]] const std::string& container() const { return container_; }
  [[nodiscard]] LocalAppLibraryManager& appLibraryManager() { return appLibraryManager_; }
  [[nodiscard]] std::shared_ptr<LocalFileEnumerator> localFileEnumerator() const;

 private:
  LocalRootEnumerator(const EnumerationServices& services, MRBAppLibraryManager& libraries,
                      std::string container, LiveUpdates liveUpdates, RunningReaders& liveReaders);

  [[nodiscard]] bool holdsAppLibraries() const;
  [[nodiscard]] bool isWorkingSet() const;
  [[nodiscard]] bool isRecursive() const;
  [[nodiscard]] std::string versions(std::uint64_t changeTokenVersion) const;
  [[nodiscard]] std::vector<URL> monitoredRoots() const;
  void monitorRoots();
  /// Files, and the version of the libraries whose folders they are told of.
  struct Monitored {
    std::shared_ptr<LocalFileEnumerator> files;
    std::uint64_t version;
  };
  [[nodiscard]] Monitored monitored() const;

  /// Takes over the main cache where the anchor can be bridged, telling what the host has to know
  /// of it, and answers the token that the file changes go on from.
  [[nodiscard]] Result<FSChangeToken> bridge(FSChangeToken token, VesselChangeObserver& observer);
  [[nodiscard]] Result<void> requireKnownVersion(const FSChangeToken& token) const;
  void upgrade(VesselChangeObserver* observer);
  void takeOverMainCache();
  void saveWorkingSetCache();

  EnumerationServices services_;
  MRBAppLibraryManager& libraries_;
  std::string container_;
  LiveUpdates liveUpdates_;
  RunningReaders& liveReaders_;
  LocalAppLibraryManager appLibraryManager_;
  mutable std::mutex mutex_;
  /// Both with mutex_, replaced together on enumQueue_.
  std::shared_ptr<LocalFileEnumerator> localFileEnumerator_;
  std::uint64_t monitoredVersion_ = 0;
  bool isRunning_ = true;  // with mutex_; until it is invalidated
  /// Bridges come one at a time: each leaves another version behind.
  SerialQueue enumQueue_{"mirabel.root-enumerator.queue"};
};

}  // namespace mirabel
