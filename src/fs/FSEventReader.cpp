#include "fs/FSEventReader.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "foundation/Log.h"
#include "fs/EventPlaces.h"
#include "fs/LogText.h"
#include "identity/MRBFileObjectIdentifier.h"

namespace mirabel {
namespace {

constexpr std::chrono::milliseconds latency{500};
constexpr std::uint32_t creationFlags =
    streamflag::useContainerTypes | streamflag::fileEvents | streamflag::useExtendedData;

std::string dropping(const URL& url) {
  return "dropping fsevent at " + url.description();
}

}  // namespace

void FSEventReaderDelegate::didDropEvent(FSEventReader&, const FileSystemEvent&,
                                         const std::optional<URL>&, DropReason) {}

std::shared_ptr<FSEventReader> FSEventReader::create(const ItemContext& context,
                                                     EventStreams& events, std::vector<URL> urls,
                                                     std::uint64_t sinceFSEventID,
                                                     FSEventReaderMode mode, Verbosity verbosity,
                                                     FSEventScope scope) {
  return std::shared_ptr<FSEventReader>(
      new FSEventReader(context, events, std::move(urls), sinceFSEventID, mode, verbosity, scope));
}

FSEventScope eventScopeOf(std::string_view container) {
  const bool isOfSeveral = container == VesselRootContainerItemIdentifier ||
                           container == VesselWorkingSetContainerItemIdentifier ||
                           container == VesselAllDirectoriesContainerItemIdentifier;
  return isOfSeveral ? FSEventScope::everything : FSEventScope::folders;
}

FSEventReader::FSEventReader(const ItemContext& context, EventStreams& events,
                             std::vector<URL> urls, std::uint64_t sinceFSEventID,
                             FSEventReaderMode mode, Verbosity verbosity, FSEventScope scope)
    : context_(context),
      events_(events),
      streamQueue_("mirabel.fsevents-stream"),
      lastProcessedFSEventID_(sinceFSEventID),
      urls_(std::move(urls)),
      mode_(mode),
      verbosity_(verbosity),
      scope_(scope),
      hiddenTest_(urls_, context.platform.resources),
      look_(context_, hiddenTest_) {}

FSEventReader::~FSEventReader() {
  if (!stream_) return;
  logError("stream deleted without being stopped; " + description());
  stream_->stop();
  stream_->invalidate();
}

std::optional<UUID> FSEventReader::volumeUUID(const Platform& platform, const URL& url) {
  const auto uuid = platform.history.historyUUID(url);
  if (!uuid) return {};
  return *uuid;
}

void FSEventReader::setDelegate(std::weak_ptr<FSEventReaderDelegate> delegate) {
  delegate_ = std::move(delegate);
}

void FSEventReader::start() {
  logWhenVerbose([&] { return "starting " + description(); });
  auto stream = createStream();
  if (!stream) {
    logError("can't create FSEvent stream for " + listOfURLs(urls_));
    return;
  }
  stream_ = *std::move(stream);
  stream_->setDispatchQueue(streamQueue_);
  stream_->start();
}

void FSEventReader::stop() {
  if (const auto stream = std::exchange(stream_, nullptr)) {
    stream->stop();
    stream->invalidate();
  }
  delegate_.reset();
  logWhenVerbose([&] { return "stopped " + description(); });
}

void FSEventReader::endTelling() {
  hasToldEnough_ = true;
  if (stream_) stream_->stop();
}

Result<std::unique_ptr<EventStream>> FSEventReader::createStream() {
  // A batch that is under way when the owner lets go of the reader finds nobody.
  auto callback = [weak = weak_from_this()](std::span<const FileSystemEvent> events) {
    if (const auto reader = weak.lock()) reader->processBatch(events);
  };
  if (mode_ == FSEventReaderMode::docIDBased) {
    // Documents are known on one volume only, that of the document storage.
    const DeviceID device =
        context_.identity.deviceID(context_.platform.manager.documentStorageURL());
    return events_.createRelativeToDevice(device, {"/.docid"}, lastProcessedFSEventID_, latency,
                                          creationFlags, std::move(callback));
  }
  return events_.createForPaths(streamPaths(), lastProcessedFSEventID_, latency, creationFlags,
                                std::move(callback));
}

std::vector<std::string> FSEventReader::streamPaths() const {
  if (scope_ == FSEventScope::everything) return {"/"};
  std::vector<std::string> paths;
  paths.reserve(urls_.size());
  for (const URL& url : urls_)
    paths.push_back(url.path());
  return paths;
}

void FSEventReader::processBatch(std::span<const FileSystemEvent> events) {
  if (!stream_ || hasToldEnough_) return;
  logWhenVerbose([&] { return "fsevent: received " + std::to_string(events.size()) + " events"; });
  const EventPlaces places(events, hiddenTest_, look_, context_.platform.resources);
  for (std::size_t index = 0; index < events.size() && !hasToldEnough_; ++index) {
    currentEvent_ = &events[index];
    process(index, events[index], places[index]);
  }
  currentEvent_ = nullptr;
  if (const auto delegate = delegate_.lock()) delegate->didProcessEvents(*this);
}

void FSEventReader::process(std::size_t index, const FileSystemEvent& event,
                            const EventPlace& place) {
  // What concerns the stream itself comes without a path.
  if (processStreamFlags(event)) return;
  if (!event.path) {
    logError("ignore event " + std::to_string(index) + " because no path can be extracted");
    return tellDrop(event, {}, DropReason::noPath);
  }
  lastProcessedFSEventID_ = std::max(lastProcessedFSEventID_, event.id);
  if (isDocumentRecord(event)) return processDocument(event, place);
  processPath(event, place);
}

/// Whether the event told of the stream and is done with.
bool FSEventReader::processStreamFlags(const FileSystemEvent& event) {
  const auto has = [&](std::uint32_t flags) { return (event.flags & flags) != 0; };
  const bool hasWrapped = has(eventflag::eventIDsWrapped);
  if (hasWrapped || has(eventflag::userDropped | eventflag::kernelDropped)) {
    logWhenVerbose([&] { return hasWrapped ? "fsevents id wrapped" : "dropped fsevents"; });
    if (const auto delegate = delegate_.lock()) delegate->mustRestart(*this);
    return true;
  }
  if (!has(eventflag::historyDone)) return false;
  lastProcessedFSEventID_ = std::max(lastProcessedFSEventID_, event.id);
  logWhenVerbose([] { return "done processing history"; });
  if (const auto delegate = delegate_.lock()) delegate->didFinishHistory(*this);
  return true;
}

void FSEventReader::processPath(const FileSystemEvent& event, const EventPlace& place) {
  const URL& url = *place.url;
  if (place.isHidden) {
    logWhenVerbose([&] { return dropping(url) + "; URL is hidden"; });
    return tellDrop(event, url, DropReason::hidden);
  }
  if (const auto library = look_.appLibraryAt(url)) return tellUpdate(library, url);
  const ItemResult item = itemOf(event, url);
  if (!item) return tellFailure(event, url, item.error());
  if (*item) return tellUpdate(*item, url);
  if (event.fileID) return tellDeletion(MRBFileObjectIdentifier::fromFileID(*event.fileID), url);
  logWhenVerbose([&] { return "dropping fsevent at \"" + *event.path + "\"; No object at path"; });
  tellDrop(event, url, DropReason::noObject);
}

FSEventReader::ItemResult FSEventReader::itemOf(const FileSystemEvent& event,
                                                const URL& url) const {
  if (!event.fileID) return look_.at(url);
  // Mostly it still is where it was; what the batch was looked at with says so for nothing.
  const auto seen = url.resources().snapshot();
  if (seen && seen->fileID == *event.fileID) return look_.at(url);
  return look_.ofFileID(*event.fileID);
}

void FSEventReader::processDocument(const FileSystemEvent& event, const EventPlace& place) {
  if (!place.document) {
    logError("can't parse docID path \"" + *event.path +
             "\"; format expected is \"/.docid/$dev/changed/$docid/src=$src,dst=$dst\"");
    return tellDrop(event, {}, DropReason::unparsable);
  }
  const std::string identifier = MRBFileObjectIdentifier::fromDocumentID(
      static_cast<std::uint64_t>(place.document->documentID));
  if (place.document->destinationFileID == 0) return tellDeletion(identifier, {});
  if (place.failure) return tellFailure(event, {}, *place.failure);
  if (!place.url) {
    logWhenVerbose([&] { return "can't compute url for " + identifier; });
    return tellDrop(event, {}, DropReason::noPlace);
  }
  const URL& url = *place.url;
  const auto drop = [&](DropReason reason, const std::string& why) {
    logWhenVerbose([&] { return dropping(url) + "; " + why; });
    tellDrop(event, url, reason);
  };
  if (!place.isMonitored) return drop(DropReason::notMonitored, "URL is not monitored");
  if (place.isHidden) return drop(DropReason::hidden, "URL is hidden");
  const ItemResult item = look_.at(url);
  if (!item) return tellFailure(event, url, item.error());
  if (!*item) return drop(DropReason::noItem, "can't create local item");
  const std::string& found = (*item)->itemIdentifierAsString();
  if (found != identifier) {
    return drop(DropReason::identifierMismatch,
                "fileObjectIDs don't match (" + found + " vs " + identifier + ")");
  }
  tellUpdate(*item, url);
}

void FSEventReader::tellUpdate(const std::shared_ptr<LocalItem>& item, const URL& url) {
  logWhenVerbose([&] { return "did change " + item->description(); });
  if (const auto delegate = delegate_.lock()) delegate->didUpdateItem(*this, item, url);
}

void FSEventReader::tellDeletion(const std::string& identifier, const std::optional<URL>& url) {
  logWhenVerbose([&] { return "did delete " + identifier; });
  if (const auto delegate = delegate_.lock()) delegate->didDeleteItem(*this, identifier, url);
}

void FSEventReader::tellDrop(const FileSystemEvent& event, const std::optional<URL>& url,
                             DropReason reason) {
  if (const auto delegate = delegate_.lock()) delegate->didDropEvent(*this, event, url, reason);
}

void FSEventReader::tellFailure(const FileSystemEvent& event, const std::optional<URL>& url,
                                const Error& error) {
  logError("can't tell what happened at \"" + *event.path + "\"; " + error.description());
  lookError_ = error;
  tellDrop(event, url, DropReason::lookFailed);
  lookError_.reset();
}

template <class Build>
void FSEventReader::logWhenVerbose(Build&& build) const {
  if (verbosity_ == Verbosity::verbose) logDebug(std::forward<Build>(build));
}

std::string FSEventReader::description() const {
  const std::string mode = mode_ == FSEventReaderMode::pathBased ? "pathBased" : "docIDBased";
  return "<FSEventReader:" + addressText(this) +
         " last:" + std::to_string(lastProcessedFSEventID_) + " mode:" + mode +
         " urls:" + listOfPaths(urls_) + ">";
}

}  // namespace mirabel
