#include "enumeration/LocalFileEnumerator.h"

#include <utility>

#include "enumeration/LocalChangesObserverContext.h"
#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "fs/LogText.h"

namespace mirabel {
namespace {

// An offset from here on counts nothing, for no folder holds so much. It keeps the cursors of two
// listings apart that stand at different places.
constexpr std::uint64_t firstPlace = std::uint64_t{1} << 62;

std::uint64_t newPlace() {
  std::uint64_t place = 0;
  for (const std::uint8_t byte : UUID::random().bytes)
    place = (place << 5) ^ byte;
  return firstPlace | (place & (firstPlace / 2 - 1));
}

std::optional<std::string> labelOfInitialPage(const Data& page) {
  if (stringView(page) == VesselInitialPageSortedByDate) return "initialPageSortedByDate";
  if (stringView(page) == VesselInitialPageSortedByName) return "initialPageSortedByName";
  return {};
}

/// Whether the token belongs to the history of now; an error, with an info line, when not.
Result<void> requireSameHistory(const FSChangeToken& token, const UUID& current) {
  if (token.deviceUUID == current) return {};
  logInfo("device UUID changed (" + token.deviceUUID.description() + " -> " +
          current.description() + ")");
  return fail(Error::syncAnchorExpired());
}

std::optional<FSChangeToken> tokenFrom(const Data& bytes) {
  auto token = FSChangeToken::decode(bytes);
  if (!token) logError("can't create change token from anchor data, resetting");
  return token;
}

}  // namespace

std::shared_ptr<LocalFileEnumerator> LocalFileEnumerator::create(
    const EnumerationServices& services, std::string container, std::vector<URL> urls,
    LiveUpdates liveUpdates) {
  return std::shared_ptr<LocalFileEnumerator>(
      new LocalFileEnumerator(services, std::move(container), std::move(urls), liveUpdates));
}

LocalFileEnumerator::LocalFileEnumerator(const EnumerationServices& services, std::string container,
                                         std::vector<URL> urls, LiveUpdates liveUpdates)
    : services_(services), scope_{std::move(container), std::move(urls)} {
  if (scope_.urls.empty()) fatalError("can't create enumerator for an empty list of URLs");
  if (scope_.isWorkingSet() || liveUpdates == LiveUpdates::unwanted) return;
  notifier_ =
      FSChangesNotifier::create(services_.items, services_.changes.events,
                                services_.changes.diagnostics, scope_.container, scope_.urls, {});
  if (notifier_) return;
  logError("can't create notifier for \"" + enumeratedItemURL().path() +
           "\"; enumeration will have no live update");
}

LocalFileEnumerator::~LocalFileEnumerator() {
  invalidate();
  if (!notifier_) return;
  // The reader must not go on behind the back of those who take the platform down next. Let go of
  // by its own notifier's signal, it cannot wait for itself.
  SerialQueue queue = notifier_->reader()->streamQueue();
  if (!queue.isCurrent()) queue.sync([] {});
}

void LocalFileEnumerator::startNotifier() {
  if (!notifier_) return;
  SerialQueue queue = notifier_->reader()->streamQueue();
  queue.async([notifier = notifier_] {
    notifier->reader()->setDelegate(notifier);
    notifier->reader()->start();
  });
}

void LocalFileEnumerator::stopNotifier() {
  if (!notifier_) return;
  SerialQueue queue = notifier_->reader()->streamQueue();
  queue.async([reader = notifier_->reader()] {
    if (reader->isRunning()) reader->stop();
  });
}

void LocalFileEnumerator::invalidate() {
  stopNotifier();
  std::set<std::shared_ptr<ChangesEnumeration>> running;
  {
    const std::lock_guard lock(mutex_);
    running.swap(enumerators_);
  }
  for (const auto& enumeration : running)
    enumeration->stop();
}

void LocalFileEnumerator::enumerateItems(VesselEnumerationObserver& observer, const Data& page) {
  auto label = labelOfInitialPage(page);
  std::optional<FSChangeToken> cursor;
  if (!label) {
    cursor = tokenFrom(page);
    if (!cursor) return observer.finishEnumeratingWithError(Error::syncAnchorExpired());
    label = cursor->description();
  }
  const LogSection section("enumerate items for " + scope_.container + " with page " + *label);
  if (auto gathered = gatherPhase(observer, cursor); !gathered) {
    observer.finishEnumeratingWithError(gathered.error());
  }
}

Result<void> LocalFileEnumerator::gatherPhase(VesselEnumerationObserver& observer,
                                              const std::optional<FSChangeToken>& cursor) {
  const auto uuid = currentUUID();
  if (!uuid) return fail(uuid.error());
  Result<Start> start = Start{};
  if (cursor) {
    if (auto same = requireSameHistory(*cursor, *uuid); !same) return same;
    start = resume(*cursor);
    if (!start) return fail(start.error());
  } else {
    logDebug("start gather phase");
    const auto eventID = services_.changes.events.currentEventID();
    if (!eventID) return fail(eventID.error());
    start->eventID = *eventID;
  }

  GatherPage page(services_.items, scope_);
  std::uint64_t counter = start->offset;
  if (!start->walk) {
    start->walk = page.makeWalk();
    const auto passedOver =
        start->walk->next(start->offset, [](const URL&) { return Result<void>{}; });
    if (!passedOver) return fail(passedOver.error());
    counter = *passedOver;
  }
  if (auto gathered = page.gather(*start->walk); !gathered) return gathered;
  if (shouldUpdateFileIDInPalimpsest()) {
    for (const auto& item : page.items())
      updateFileIDInPalimpsest(*item);
  }
  logDebug("discovered " + std::to_string(page.items().size()) + " items for " + scope_.container);
  observer.didEnumerateItems(page.items());
  return finishPage(observer, *std::move(start), *uuid, counter + page.entryCount());
}

Result<LocalFileEnumerator::Start> LocalFileEnumerator::resume(const FSChangeToken& cursor) {
  using Case = FSEventReaderGatherPhaseResumeStatus::Case;
  logDebug("resume gather phase at offset " + std::to_string(cursor.offset));
  // Taken whatever comes: the host will not come back with this cursor.
  auto walk = services_.walks.take(scope_.container, cursor.encode());
  const GatherPhaseResumeCheck check = canResumeGatherPhase(
      services_.items, services_.changes.events, scope_.urls, cursor.streamEventID);
  switch (check.status.status) {
    case Case::cantReplayHistoricalFSEvents:
      logInfo("can't replay historical FSEvents, need to re-start gather phase from scratch");
      return fail(Error::syncAnchorExpired());
    case Case::deletionOccurred:
      logInfo("deletion of " + check.status.deletedItem + " requires to re-gather from scratch");
      return fail(Error::syncAnchorExpired());
    case Case::canResume:
      break;
  }
  const auto stands = isWhereItStood(walk, cursor, check);
  if (!stands) return fail(stands.error());
  if (!*stands) {
    logInfo("what was listed has been moved, need to re-start gather phase from scratch");
    return fail(Error::syncAnchorExpired());
  }
  logDebug("safe to resume gather phase from FSEventID " + std::to_string(cursor.streamEventID));
  // As of the event that the next cursor holds, the place that a kept walk goes on from may have
  // another offset by now.
  const bool isPlace = walk && check.haveNamesChanged;
  return Start{isPlace ? newPlace() : cursor.offset, check.lastProcessedFSEventID, std::move(walk)};
}

/// What the events alone do not tell. A walk that was kept, or is taken up at the position that
/// was, stands where it stood, whatever names have left, but a folder that was moved may have gone
/// from what it has yet to enter to what it has passed. An offset leads elsewhere once a name
/// before it has left: a neighbour would be skipped.
Result<bool> LocalFileEnumerator::isWhereItStood(std::unique_ptr<FSDirectoryWalk>& walk,
                                                 const FSChangeToken& cursor,
                                                 const GatherPhaseResumeCheck& check) const {
  const bool mayHavePassed = scope_.isRecursive() && check.hasFolderMoved;
  if (walk) return !mayHavePassed && walk->resume();
  const auto position = keptPosition(cursor.encode());
  if (!position) return !check.hasNameLeft && cursor.offset < firstPlace;
  if (mayHavePassed) return false;
  walk = GatherPage(services_.items, scope_).makeWalk();
  return walk->restore(*position);
}

std::optional<WalkPosition> LocalFileEnumerator::keptPosition(const Data& cursor) const {
  const auto bytes = services_.items.platform.positions.find(scope_.container, cursor);
  return bytes && !bytes->empty() ? WalkPosition::decode(*bytes) : std::nullopt;
}

/// In this process and, before the host has the cursor, on disk for another. Where a position can't
/// be kept the listing goes on by its offset; so do two that have the same cursor at different
/// places, for something happened while their pages were made.
void LocalFileEnumerator::keepForNextPage(std::unique_ptr<FSDirectoryWalk> walk,
                                          const Data& cursor) const {
  walk->pause();
  ListingPositions& positions = services_.items.platform.positions;
  const auto place = walk->position();
  Data position = place ? place->encode() : Data();
  const auto standing = positions.find(scope_.container, cursor);
  if (standing && *standing != position) {
    services_.walks.spoil(scope_.container, cursor);
    position.clear();
  } else if (!services_.walks.keep(scope_.container, cursor, std::move(walk), position)) {
    position.clear();
  }
  if (position.empty() && !standing) return;
  const auto kept = positions.keep(scope_.container, cursor, position);
  if (!kept)
    logDebug([&] { return "can't keep a listing's position; " + kept.error().description(); });
}

Result<void> LocalFileEnumerator::finishPage(VesselEnumerationObserver& observer, Start start,
                                             const UUID& deviceUUID, std::uint64_t counter) {
  if (counter < start.offset) {
    logInfo("enumerator returned an offset (" + std::to_string(counter) +
            ") smaller than the initial offset " + std::to_string(start.offset));
    return fail(Error::syncAnchorExpired());
  }
  if (counter - start.offset == GatherPage::limit) {
    const Data cursor = FSChangeToken{0, deviceUUID, start.eventID, counter, 0}.encode();
    keepForNextPage(std::move(start.walk), cursor);
    observer.finishEnumeratingUpToPage(cursor);
    return {};
  }
  if (scope_.isRecursive() && hasFolderMovedSince(start.eventID)) {
    logInfo("a folder was moved while it was listed, need to re-start gather phase from scratch");
    return fail(Error::syncAnchorExpired());
  }
  logDebug([&] { return "gather phase finished for " + listOfPaths(scope_.roots()); });
  observer.finishEnumeratingUpToPage(std::nullopt);
  return {};
}

/// A folder that was moved in front of the walk to where it had passed was never entered, and no
/// change will tell of what lies in it.
bool LocalFileEnumerator::hasFolderMovedSince(std::uint64_t eventID) const {
  return canResumeGatherPhase(services_.items, services_.changes.events, scope_.urls, eventID)
      .hasFolderMoved;
}

void LocalFileEnumerator::enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                                           const Data& anchor) {
  const auto token = tokenFrom(anchor);
  if (!token) return observer->finishEnumeratingWithError(Error::syncAnchorExpired());
  const LogSection section("enumerate changes for " + scope_.container + " with token " +
                           token->description());
  const auto uuid = currentUUID();
  const Result<void> usable =
      uuid ? requireSameHistory(*token, *uuid) : Result<void>(fail(uuid.error()));
  if (!usable) return observer->finishEnumeratingWithError(usable.error());
  startChanges(std::move(observer), *token);
}

void LocalFileEnumerator::startChanges(std::shared_ptr<VesselChangeObserver> observer,
                                       const FSChangeToken& token) {
  const auto context = std::make_shared<LocalChangesObserverContext>(
      std::move(observer), shared_from_this(), shouldUpdateFileIDInPalimpsest());
  const auto enumeration =
      services_.changes.changes.make(token, scope_.container, scope_.urls, context);
  context->setFSChangesEnumerator(enumeration);
  {
    // Before the start: one that finishes at once must find itself here.
    const std::lock_guard lock(mutex_);
    enumerators_.insert(enumeration);
  }
  enumeration->start();
}

void LocalFileEnumerator::currentSyncAnchor(
    const std::function<void(std::optional<Data>)>& completionHandler) {
  const auto uuid = FSEventReader::volumeUUID(services_.items.platform, enumeratedItemURL());
  if (!uuid) {
    logError("can't get volume UUID for \"" + enumeratedItemURL().path() + "\"");
    return completionHandler(std::nullopt);
  }
  const auto eventID = services_.changes.events.currentEventID();
  if (!eventID) {
    logError("can't read the event history; " + eventID.error().description());
    return completionHandler(std::nullopt);
  }
  completionHandler(FSChangeToken{0, *uuid, *eventID, 0, 0}.encode());
}

Result<UUID> LocalFileEnumerator::currentUUID() const {
  const auto uuid = FSEventReader::volumeUUID(services_.items.platform, enumeratedItemURL());
  if (uuid) return *uuid;
  logError("can't get volume UUID for " + enumeratedItemURL().path());
  return fail(Error::local(LocalVesselError::unableToGetDeviceUUID));
}

void LocalFileEnumerator::updateFileIDInPalimpsest(const LocalItem& item) const {
  logDebug([&] { return "updating fileID in palimpsest for " + item.description(); });
  // For what the store learns on the way; it has nothing to tell, and failing does no harm.
  static_cast<void>(services_.items.platform.documents.permanentStorageForItemAtURL(
      item.fileURL(), Allocation::never));
}

void LocalFileEnumerator::forget(const std::shared_ptr<ChangesEnumeration>& enumeration) {
  const std::lock_guard lock(mutex_);
  enumerators_.erase(enumeration);
}

std::size_t LocalFileEnumerator::runningEnumerations() const {
  const std::lock_guard lock(mutex_);
  return enumerators_.size();
}

}  // namespace mirabel
