#include "enumeration/LocalRootEnumerator.h"

#include <algorithm>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "fs/LogText.h"
#include "items/LocalAppLibraryItem.h"

namespace mirabel {
namespace {

bool isInitialPage(const Data& page) {
  return stringView(page) == VesselInitialPageSortedByName ||
         stringView(page) == VesselInitialPageSortedByDate;
}

/// Has the page's cursor carry the version of the libraries whose folders are walked.
class VersionedPage final : public VesselEnumerationObserver {
 public:
  VersionedPage(VesselEnumerationObserver& observer, std::uint64_t version)
      : observer_(observer), version_(version) {}

  void didEnumerateItems(const VesselItems& items) override { observer_.didEnumerateItems(items); }
  void finishEnumeratingWithError(const Error& error) override {
    observer_.finishEnumeratingWithError(error);
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& nextPage) override {
    if (!nextPage) return observer_.finishEnumeratingUpToPage(nextPage);
    auto cursor = FSChangeToken::decode(*nextPage);
    if (!cursor) fatalError("a page cursor of this process can't be decoded");
    cursor->appLibraryVersionToken = version_;
    observer_.finishEnumeratingUpToPage(cursor->encode());
  }

 private:
  VesselEnumerationObserver& observer_;
  std::uint64_t version_;
};

/// Keeps what a host is to be told of app libraries until it can be.
class ToldLibraries final : public VesselChangeObserver {
 public:
  void tell(VesselChangeObserver& observer) const {
    if (!updated_.empty()) observer.didUpdateItems(updated_);
    if (!deleted_.empty()) observer.didDeleteItemsWithIdentifiers(deleted_);
  }

  void didUpdateItems(const VesselItems& items) override { updated_ = items; }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    deleted_ = identifiers;
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data&, bool) override {}
  void finishEnumeratingWithError(const Error&) override {}

 private:
  VesselItems updated_;
  std::vector<std::string> deleted_;
};

}  // namespace

std::shared_ptr<LocalRootEnumerator> LocalRootEnumerator::create(
    const EnumerationServices& services, MRBAppLibraryManager& libraries, std::string container,
    LiveUpdates liveUpdates, RunningReaders& liveReaders) {
  std::shared_ptr<LocalRootEnumerator> enumerator(
      new LocalRootEnumerator(services, libraries, std::move(container), liveUpdates, liveReaders));
  // Of all directories no version is told, so that it need not go on from an older one.
  if (!enumerator->holdsAppLibraries()) enumerator->appLibraryManager_.upgradeFromMainCache();
  enumerator->monitorRoots();
  return enumerator;
}

LocalRootEnumerator::LocalRootEnumerator(const EnumerationServices& services,
                                         MRBAppLibraryManager& libraries, std::string container,
                                         LiveUpdates liveUpdates, RunningReaders& liveReaders)
    : services_(services),
      libraries_(libraries),
      container_(std::move(container)),
      liveUpdates_(liveUpdates),
      liveReaders_(liveReaders),
      appLibraryManager_(services.items.platform, libraries.caches(),
                         isWorkingSet() ? LocalAppLibraryCacheSource::workingSet
                                        : LocalAppLibraryCacheSource::main) {}

bool LocalRootEnumerator::isWorkingSet() const {
  return container_ == VesselWorkingSetContainerItemIdentifier;
}

bool LocalRootEnumerator::isRecursive() const {
  return container_ != VesselRootContainerItemIdentifier;
}

bool LocalRootEnumerator::holdsAppLibraries() const {
  return container_ != VesselAllDirectoriesContainerItemIdentifier;
}

std::shared_ptr<LocalFileEnumerator> LocalRootEnumerator::localFileEnumerator() const {
  const std::lock_guard lock(mutex_);
  return localFileEnumerator_;
}

// The monitored roots ---------------------------------------------------------------------------

std::vector<URL> LocalRootEnumerator::monitoredRoots() const {
  std::vector<URL> roots{services_.items.platform.manager.documentStorageURL()};
  for (URL& folder : appLibraryManager_.folders())
    roots.push_back(std::move(folder));
  return roots;
}

/// Files are told by a new enumerator; what the former one has under way goes on.
void LocalRootEnumerator::monitorRoots() {
  const std::uint64_t version = appLibraryManager_.versionToken();
  const auto next =
      LocalFileEnumerator::create(services_, container_, monitoredRoots(), liveUpdates_);
  std::shared_ptr<LocalFileEnumerator> former;
  {
    const std::lock_guard lock(mutex_);
    former = std::exchange(localFileEnumerator_, next);
    monitoredVersion_ = version;
    // The new one hears of what happens before the former one stops hearing of it.
    if (isRunning_) {
      if (const auto& notifier = next->notifier()) liveReaders_.add(notifier->reader());
      next->startNotifier();
    }
  }
  if (former) former->stopNotifier();
}

LocalRootEnumerator::Monitored LocalRootEnumerator::monitored() const {
  const std::lock_guard lock(mutex_);
  return {localFileEnumerator_, monitoredVersion_};
}

// Items -----------------------------------------------------------------------------------------

void LocalRootEnumerator::enumerateItems(VesselEnumerationObserver& observer, const Data& page) {
  const LogSection section("enumerate root items for " + container_);
  if (isInitialPage(page)) takeOverMainCache();
  const auto [files, version] = monitored();
  VersionedPage versioned(observer, version);
  if (isInitialPage(page)) {
    if (holdsAppLibraries()) observer.didEnumerateItems(appLibraryManager_.appLibraries());
    return files->enumerateItems(versioned, page);
  }
  auto cursor = FSChangeToken::decode(page);
  if (!cursor) {
    logError("can't create change token from anchor data, resetting");
    return observer.finishEnumeratingWithError(Error::syncAnchorExpired());
  }
  // The root itself goes no further than the document storage.
  if (isRecursive() && cursor->appLibraryVersionToken != version) {
    logInfo("the app libraries changed while they were listed, need to restart from scratch " +
            versions(cursor->appLibraryVersionToken));
    return observer.finishEnumeratingWithError(Error::syncAnchorExpired());
  }
  cursor->appLibraryVersionToken = 0;
  files->enumerateItems(versioned, cursor->encode());
}

// Changes ---------------------------------------------------------------------------------------

void LocalRootEnumerator::enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                                           const Data& anchor) {
  const LogSection section("enumerate root changes for " + container_);
  const auto token = FSChangeToken::decode(anchor);
  if (!token) {
    logError("can't create change token from anchor data, resetting");
    return observer->finishEnumeratingWithError(Error::syncAnchorExpired());
  }
  logDebug([&] { return "notifying app library changes since " + token->description(); });
  Result<FSChangeToken> next = *token;
  std::shared_ptr<LocalFileEnumerator> files;
  ToldLibraries told;
  enumQueue_.sync([&] {
    next = bridge(*token, told);
    files = localFileEnumerator();
  });
  // Off the queue: the host may ask for more when it is told.
  told.tell(*observer);
  if (!next) return observer->finishEnumeratingWithError(next.error());
  files->enumerateChanges(std::move(observer), next->encode());
}

Result<FSChangeToken> LocalRootEnumerator::bridge(FSChangeToken token,
                                                  VesselChangeObserver& observer) {
  const std::uint64_t version = token.appLibraryVersionToken;
  const bool tellsLibraries = holdsAppLibraries();
  if (tellsLibraries) {
    if (auto known = requireKnownVersion(token); !known) return fail(known.error());
  }
  const bool isKnown = version == appLibraryManager_.versionToken();
  if (tellsLibraries && isKnown) logDebug("change token version matches local version");
  if (tellsLibraries && !isKnown) {
    logDebug("change token version is zero, let's send all the app-libraries known");
  }
  upgrade(tellsLibraries && isKnown ? &observer : nullptr);
  if (tellsLibraries && !isKnown) observer.didUpdateItems(appLibraryManager_.appLibraries());
  token.appLibraryVersionToken = appLibraryManager_.versionToken();
  // What lies in libraries that came or went since that version is told by events that the anchor
  // may have passed already, under the libraries of before.
  const std::uint64_t lastEvent = services_.changes.events.lastEventIDUnder(version);
  if (version != token.appLibraryVersionToken && lastEvent < token.streamEventID) {
    token.streamEventID = lastEvent;
    token.offset = 0;
  }
  return token;
}

Result<void> LocalRootEnumerator::requireKnownVersion(const FSChangeToken& token) const {
  const std::uint64_t version = token.appLibraryVersionToken;
  const std::uint64_t localVersion = appLibraryManager_.versionToken();
  if (localVersion < version) {
    logInfo("app-library version is greater than local version, need to restart from scratch " +
            versions(version));
    return fail(Error::syncAnchorExpired());
  }
  if (version == 0 || version == localVersion) return {};
  logError("change token version matches nothing, need to restart from scratch " +
           versions(version));
  return fail(Error::syncAnchorExpired());
}

void LocalRootEnumerator::upgrade(VesselChangeObserver* observer) {
  if (!appLibraryManager_.upgradeFromMainCache(observer)) return;
  monitorRoots();
  logDebug([&] {
    return "updated root enumerator to monitor " + listOfPaths(localFileEnumerator()->urls());
  });
  if (isWorkingSet()) saveWorkingSetCache();
}

/// Who starts afresh is told the libraries of now: nothing has to be bridged for him. Anchors of
/// before are refused from then on.
void LocalRootEnumerator::takeOverMainCache() {
  if (enumQueue_.isCurrent()) return;
  enumQueue_.sync([this] { upgrade(nullptr); });
}

void LocalRootEnumerator::saveWorkingSetCache() {
  const auto content = appLibraryManager_.content();
  const auto saved = libraries_.caches().workingSet.save(content.records, content.versionToken,
                                                         LocalAppLibraryCache::Increment::no);
  if (!saved) logError("can't save working-set cache to disk; " + saved.error().description());
}

std::string LocalRootEnumerator::versions(std::uint64_t changeTokenVersion) const {
  std::string text = "[changeTokenVersion: " + std::to_string(changeTokenVersion) +
                     ", localVersion: " + std::to_string(appLibraryManager_.versionToken());
  if (isWorkingSet())
    text += ", workingSetVersion: " + std::to_string(libraries_.shared().versionToken());
  return text + ", mainCacheVersion: " + std::to_string(libraries_.caches().main.versionToken()) +
         "]";
}

void LocalRootEnumerator::currentSyncAnchor(
    const std::function<void(std::optional<Data>)>& completionHandler) {
  takeOverMainCache();
  // What is told of a later version is told again to whoever holds an earlier one.
  const Monitored now = monitored();
  now.files->currentSyncAnchor([&](std::optional<Data> anchor) {
    auto token = anchor ? FSChangeToken::decode(*anchor) : std::nullopt;
    if (!token) return completionHandler(std::nullopt);
    token->appLibraryVersionToken = now.version;
    completionHandler(token->encode());
  });
}

void LocalRootEnumerator::invalidate() {
  std::shared_ptr<LocalFileEnumerator> files;
  {
    const std::lock_guard lock(mutex_);
    isRunning_ = false;
    files = localFileEnumerator_;
  }
  if (files) files->invalidate();
}

}  // namespace mirabel
