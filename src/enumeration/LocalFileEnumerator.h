#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "enumeration/EnumerationServices.h"
#include "enumeration/GatherPage.h"
#include "fs/FSChangesNotifier.h"
#include "fs/GatherPhaseResumeCheck.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// Lists the files of one container page by page and tells what changed in it: an ordinary
/// folder, the working set, or all directories. It keeps no state between pages: another
/// enumerator of the container, in another process too, goes on at a cursor at the same cost. Any
/// thread may call it.
class LocalFileEnumerator final : public VesselEnumerator,
                                  public std::enable_shared_from_this<LocalFileEnumerator> {
 public:
  /// `urls` are the folders to walk, the document storage the first of several; none at all is a
  /// programming error. An ordinary container has its one folder. Where no notifier can be made,
  /// which is logged, or live updates are not wanted, it does everything else.
  [[nodiscard]] static std::shared_ptr<LocalFileEnumerator> create(
      const EnumerationServices& services, std::string container, std::vector<URL> urls,
      LiveUpdates liveUpdates = LiveUpdates::wanted);
  /// Invalidates, and waits until the notifier is at rest: at most as long as that waits for the
  /// host.
  ~LocalFileEnumerator() override;

  void enumerateItems(VesselEnumerationObserver& observer, const Data& page) override;
  void enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                        const Data& anchor) override;
  void currentSyncAnchor(
      const std::function<void(std::optional<Data>)>& completionHandler) override;
  /// Stops the notifier and every enumeration of changes that is under way.
  void invalidate() override;

  /// Makes the notifier the delegate of its reader, and submits the start of that.
  void startNotifier();
  /// Submits the end of that. Enumerations of changes go on.
  void stopNotifier();

  [[nodiscard]] const std::string& container() const { return scope_.container; }
  [[nodiscard]] const URL& enumeratedItemURL() const { return scope_.urls.front(); }
  [[nodiscard]] const std::vector<URL>& urls() const { return scope_.urls; }
  /// Null for the working set, where none could be made, and where none is wanted.
  [[nodiscard]] const std::shared_ptr<FSChangesNotifier>& notifier() const { return notifier_; }
  [[nodiscard]] bool shouldUpdateFileIDInPalimpsest() const { return scope_.isWorkingSet(); }
  [[nodiscard]] std::size_t runningEnumerations() const;

  // For the context of its enumerations of changes.
  void updateFileIDInPalimpsest(const LocalItem& item) const;
  void forget(const std::shared_ptr<ChangesEnumeration>& enumeration);

 private:
  /// Where a page starts: at an offset, or with the walk that was kept.
  struct Start {
    std::uint64_t offset = 0;
    std::uint64_t eventID = 0;
    std::unique_ptr<FSDirectoryWalk> walk{};
  };

  LocalFileEnumerator(const EnumerationServices& services, std::string container,
                      std::vector<URL> urls, LiveUpdates liveUpdates);

  [[nodiscard]] Result<void> gatherPhase(VesselEnumerationObserver& observer,
                                         const std::optional<FSChangeToken>& cursor);
  [[nodiscard]] Result<Start> resume(const FSChangeToken& cursor);
  [[nodiscard]] Result<bool> isWhereItStood(std::unique_ptr<FSDirectoryWalk>& walk,
                                            const FSChangeToken& cursor,
                                            const GatherPhaseResumeCheck& check) const;
  [[nodiscard]] std::optional<WalkPosition> keptPosition(const Data& cursor) const;
  void keepForNextPage(std::unique_ptr<FSDirectoryWalk> walk, const Data& cursor) const;
  [[nodiscard]] Result<void> finishPage(VesselEnumerationObserver& observer, Start start,
                                        const UUID& deviceUUID, std::uint64_t counter);
  [[nodiscard]] bool hasFolderMovedSince(std::uint64_t eventID) const;
  [[nodiscard]] Result<UUID> currentUUID() const;
  void startChanges(std::shared_ptr<VesselChangeObserver> observer, const FSChangeToken& token);

  EnumerationServices services_;
  GatherScope scope_;
  std::shared_ptr<FSChangesNotifier> notifier_;
  mutable std::mutex mutex_;
  std::set<std::shared_ptr<ChangesEnumeration>> enumerators_;  // with mutex_
};

}  // namespace mirabel
