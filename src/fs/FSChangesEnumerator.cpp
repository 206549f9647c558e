#include "fs/FSChangesEnumerator.h"

#include <algorithm>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "fs/DocumentIDPath.h"
#include "identity/MRBFileObjectIdentifier.h"
#include "items/LocalAppLibraryItem.h"

namespace mirabel {
namespace {

std::vector<URL> atLeastOne(std::vector<URL> urls) {
  if (urls.empty()) fatalError("require at least one URL to init a change enumerator");
  return urls;
}

std::uint64_t aheadOf(const FSChangeToken& token) {
  return token.offset & ~FSChangesEnumerator::offsetMark;
}

}  // namespace

FSChangesEnumerator::FSChangesEnumerator(const ItemContext& context, EventStreams& events,
                                         const AppLibraryRoots& roots, const FSChangeToken& token,
                                         std::string container, std::vector<URL> urls,
                                         std::shared_ptr<VesselChangeObserver> observer,
                                         std::shared_ptr<RunningReaders> running)
    : context_(context),
      events_(events),
      currentToken_(token),
      container_(std::move(container)),
      urls_(atLeastOne(std::move(urls))),
      observer_(std::move(observer)),
      sinceFSEventID_(token.streamEventID),
      startup_(events.currentEventID()),
      startupFSEventID_(startup_.value_or(token.streamEventID)),
      shown_(context_, roots, urls_,
             isFolderContainer() ? LinkNames::Depth::children : LinkNames::Depth::everything),
      running_(std::move(running)),
      passedEventID_(token.streamEventID) {}

// The two passes --------------------------------------------------------------------------------

void FSChangesEnumerator::start() {
  currentToken_.version = 0;
  // The page of a listing carries an offset too, and must not be half believed.
  if (currentToken_.offset != 0 && (currentToken_.offset & offsetMark) == 0) {
    return finishWithError(Error::syncAnchorExpired());
  }
  if (!startup_) return finishWithError(startup_.error());
  startReader(FSEventReaderMode::pathBased, sinceFSEventID_ + aheadOf(currentToken_));
}

void FSChangesEnumerator::stop() {
  isFinished_ = true;
  stopReader();
}

void FSChangesEnumerator::startReader(FSEventReaderMode mode, std::uint64_t since) {
  passedEventID_ = since;
  const auto reader = FSEventReader::create(context_, events_, urls_, since, mode, Verbosity::quiet,
                                            eventScopeOf(container_));
  SerialQueue readerQueue = reader->streamQueue();
  {
    const std::lock_guard lock(mutex_);
    if (isFinished_) return;
    reader_ = reader;
  }
  running_->add(reader);
  readerQueue.async([self = shared_from_this(), reader] {
    if (self->isFinished_) return;
    reader->setDelegate(self);
    reader->start();
    // A history that can't be read must not look like one in which nothing happened.
    if (!reader->isRunning()) self->finishWithError(Error::syncAnchorExpired());
  });
}

void FSChangesEnumerator::stopReader() {
  std::shared_ptr<FSEventReader> reader;
  {
    const std::lock_guard lock(mutex_);
    reader = std::exchange(reader_, nullptr);
  }
  if (!reader) return;
  SerialQueue readerQueue = reader->streamQueue();
  // Submitted behind the delivery that is under way, the end would come after all of the history.
  if (readerQueue.isCurrent()) reader->endTelling();
  readerQueue.async([reader] {
    if (reader->isRunning()) reader->stop();
  });
}

void FSChangesEnumerator::didFinishHistory(FSEventReader&) {
  if (isFinished_) return;
  passedEventID_ = startupFSEventID_;
  ++numberOfReaderCaughtUp_;
  if (!pathBasedReaderState_) {
    pathBasedReaderState_ =
        FSReaderState{startupFSEventID_, startupFSEventID_ - sinceFSEventID_, numberOfChanges_};
    numberOfChanges_ = 0;
    stopReader();
    return startReader(FSEventReaderMode::docIDBased, sinceFSEventID_);
  }
  finish(false);
}

void FSChangesEnumerator::mustRestart(FSEventReader&) {
  finishWithError(Error::syncAnchorExpired());
}

void FSChangesEnumerator::didProcessEvents(FSEventReader&) {}

bool FSChangesEnumerator::accepts(const FileSystemEvent& event) {
  // Later events are the next anchor's.
  if (isFinished_ || event.id > startupFSEventID_) return false;
  // Of a document's ID and of its file's an item and a deletion each, and an item around them.
  constexpr std::uint64_t mostPerEvent = 5;
  if (order_.size() + mostPerEvent > changesPerBatch) {
    endBatch();
    return false;
  }
  passedEventID_ = event.id;
  return true;
}

void FSChangesEnumerator::endBatch() {
  finish(true);
}

void FSChangesEnumerator::finish(bool moreComing) {
  if (isFinished_.exchange(true)) return;
  if (!moreComing && !pathBasedReaderState_) fatalError("path based reader bookmark is missing");
  const std::uint64_t path =
      pathBasedReaderState_ ? pathBasedReaderState_->eventID : passedEventID_;
  const std::uint64_t document = pathBasedReaderState_ ? passedEventID_ : sinceFSEventID_;
  currentToken_.streamEventID = document;
  currentToken_.offset = path == document ? 0 : offsetMark | (path - document);
  if (pathBasedReaderState_) numberOfChanges_ += pathBasedReaderState_->numberOfChanges;
  if (numberOfChanges_ > changesPerBatch) {
    logError("invalid number of changes (" + std::to_string(numberOfChanges_) + ", " +
             std::to_string(aheadOf(currentToken_)) + " shouldn't be greater than " +
             std::to_string(changesPerBatch) + ")");
  }
  if (!moreComing) {
    logDebug([&] {
      return "fetching changes did catch up (eventID:" +
             std::to_string(currentToken_.streamEventID) +
             " offset:" + std::to_string(aheadOf(currentToken_)) + ")";
    });
  }
  VesselItems updated;
  std::vector<std::string> deleted;
  for (const std::string& identifier : order_) {
    const auto& item = changes_.at(identifier);
    item ? updated.push_back(item) : deleted.push_back(identifier);
  }
  if (!updated.empty()) observer_->didUpdateItems(updated);
  if (!deleted.empty()) observer_->didDeleteItemsWithIdentifiers(deleted);
  const auto self = shared_from_this();
  stopReader();
  observer_->finishEnumeratingChangesUpToSyncAnchor(currentToken_.encode(), moreComing);
}

void FSChangesEnumerator::finishWithError(const Error& error) {
  if (isFinished_.exchange(true)) return;
  if (error.is(VesselErrorCode::syncAnchorExpired)) {
    logInfo("fetching changes did finish after reset");
  }
  const auto self = shared_from_this();
  stopReader();
  observer_->finishEnumeratingWithError(error);
}

// What became of things -------------------------------------------------------------------------

void FSChangesEnumerator::didUpdateItem(FSEventReader& reader,
                                        const std::shared_ptr<LocalItem>& item, const URL& url) {
  const FileSystemEvent& event = *reader.currentEvent();
  if (!accepts(event)) return;
  const auto shown = shown_.asShown(item);
  if (!shown) return finishWithError(shown.error());
  if (!*shown) return settle(event);
  forwardUpdate(*shown, url);
  // What it was when this happened may be another identity of the same thing, or of another that
  // has its place now.
  const std::string& told = (*shown)->itemIdentifier();
  if (event.fileID && (*shown)->fileID() != event.fileID) return settle(event);
  if (event.documentID) {
    const std::string document = MRBFileObjectIdentifier::fromDocumentID(*event.documentID);
    if (document != told) settleIdentifier(document, true, url);
  }
  // What was no document then was known by its file ID.
  const bool wasKnownByFile = !event.documentID || (event.flags & eventflag::changedKind) != 0;
  if (event.fileID && wasKnownByFile && !told.starts_with('#')) {
    const std::string file = MRBFileObjectIdentifier::fromFileID(*event.fileID);
    if (file != told) settleIdentifier(file, true, url);
  }
}

void FSChangesEnumerator::didDeleteItem(FSEventReader& reader, const std::string& identifier,
                                        const std::optional<URL>&) {
  const FileSystemEvent& event = *reader.currentEvent();
  if (!accepts(event)) return;
  if (event.fileID) return settle(event);
  settleIdentifier(identifier, true, {});
}

void FSChangesEnumerator::didDropEvent(FSEventReader& reader, const FileSystemEvent& event,
                                       const std::optional<URL>& url, DropReason reason) {
  if (reason == DropReason::noPath || reason == DropReason::unparsable || !accepts(event)) return;
  if (reason == DropReason::lookFailed) return finishWithError(*reader.lookError());
  if (reader.mode() == FSEventReaderMode::docIDBased) {
    const auto record = DocumentIDPath::parse(*event.path);
    if (record && record->documentID > 0) {
      const auto document = static_cast<std::uint64_t>(record->documentID);
      settleIdentifier(MRBFileObjectIdentifier::fromDocumentID(document), true, {});
    }
    return;
  }
  settle(event);
  if (url && reason == DropReason::hidden && !isFinished_) settlePackageAround(*url);
}

void FSChangesEnumerator::settle(const FileSystemEvent& event) {
  if (!event.fileID) return;
  const URL url = URL::fileURL(*event.path);
  // A document is known by its document ID alone, but where it became one, or stopped to be.
  const std::string file = MRBFileObjectIdentifier::fromFileID(*event.fileID);
  const bool changedKind = (event.flags & eventflag::changedKind) != 0;
  if (event.documentID) {
    settleIdentifier(MRBFileObjectIdentifier::fromDocumentID(*event.documentID), true, url);
  }
  settleIdentifier(file, !event.documentID || changedKind, url);
}

// The object of a file ID may be shown under a document ID by now: then that is told.
void FSChangesEnumerator::settleIdentifier(const std::string& identifier, bool reportDeletion,
                                           const std::optional<URL>& eventURL) {
  if (isFinished_) return;
  auto item = shown_.ofIdentifier(identifier);
  if (!item) return finishWithError(item.error());
  if (*item) forwardUpdate(*item, eventURL.value_or((*item)->url()));
  const bool isItself = *item && (*item)->itemIdentifier() == identifier;
  if (!isItself && reportDeletion) forwardDeletion(identifier);
}

void FSChangesEnumerator::settlePackageAround(const URL& url) {
  std::vector<URL> above;
  for (URL folder = url.deletingLastPathComponent(); folder.path().size() > 1;
       folder = folder.deletingLastPathComponent()) {
    above.push_back(folder);
  }
  // The outermost one is shown; what is in it is not.
  for (auto folder = above.rbegin(); folder != above.rend(); ++folder) {
    if (!shown_.isInSight(*folder)) continue;
    const URL fresh = URL::fileURL(folder->path());
    const auto values = context_.platform.resources.readValues(fresh);
    if (!values || !values->isPackage) continue;
    auto item = shown_.at(fresh);
    if (!item) return finishWithError(item.error());
    if (*item) forwardUpdate(*item, fresh);
    return;
  }
}

// Telling ---------------------------------------------------------------------------------------

bool FSChangesEnumerator::isFolderContainer() const {
  return container_ != VesselWorkingSetContainerItemIdentifier &&
         container_ != VesselAllDirectoriesContainerItemIdentifier;
}

std::optional<std::string> FSChangesEnumerator::reasonToIgnore(const LocalItem& item,
                                                               const URL& eventURL) const {
  const std::string& identifier = item.itemIdentifier();
  if (identifier == VesselRootContainerItemIdentifier || identifier == container_) {
    return "; item is the container";
  }
  if (!isFolderContainer() && identifier.starts_with('#')) {
    return "; app library are not indexed";
  }
  if (container_ == VesselAllDirectoriesContainerItemIdentifier && !item.vs_isContainer()) {
    return "; item is not a directory";
  }
  if (!isFolderContainer()) return {};
  // Who left the folder is told with its new parent; what lies deeper is another folder's.
  const URL parent = eventURL.properURL().deletingLastPathComponent();
  const bool wasHere = parent == urls_.front().properURL() || !shown_.isOfContainer(eventURL);
  if (item.parentItemIdentifier() == container_ || wasHere) return {};
  return "; item is not a directory of " + container_;
}

void FSChangesEnumerator::forwardUpdate(const std::shared_ptr<LocalItem>& item,
                                        const URL& eventURL) {
  if (const auto reason = reasonToIgnore(*item, eventURL)) {
    logDebug([&] { return "ignore update of " + item->url().path() + *reason; });
    return;
  }
  // All directories are listed without the trash: a folder that went there has left.
  if (container_ == VesselAllDirectoriesContainerItemIdentifier && item->isTrashed()) {
    return forwardDeletion(item->itemIdentifier());
  }
  logDebug([&] { return "forward update of " + item->url().path(); });
  const auto [place, isNew] = changes_.insert_or_assign(item->itemIdentifier(), item);
  if (!isNew) return;
  order_.push_back(place->first);
  ++numberOfChanges_;
}

void FSChangesEnumerator::forwardDeletion(const std::string& identifier) {
  if (identifier == container_) return;
  logDebug([&] { return "forward deletion of " + identifier; });
  const auto [place, isNew] = changes_.insert_or_assign(identifier, nullptr);
  if (!isNew) return;
  order_.push_back(place->first);
  ++numberOfChanges_;
}

}  // namespace mirabel
