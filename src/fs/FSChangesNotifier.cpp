#include "fs/FSChangesNotifier.h"

#include <limits>
#include <utility>

#include "foundation/DispatchGroup.h"
#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "fs/LogText.h"

namespace mirabel {

std::shared_ptr<FSChangesNotifier> FSChangesNotifier::create(
    const ItemContext& context, EventStreams& events, DiagnosticReporter& diagnostics,
    std::string container, std::vector<URL> urls, Options options) {
  if (urls.empty()) fatalError("require at least one URL to init a change notifier");
  const auto deviceUUID = FSEventReader::volumeUUID(context.platform, urls.front());
  if (!deviceUUID) {
    logError("can't get volume UUID for \"" + urls.front().path() + "\"");
    return nullptr;
  }
  // From an event that never was, the reader begins by telling that it has lost some.
  const std::uint64_t since =
      events.currentEventID().value_or(std::numeric_limits<std::uint64_t>::max());
  auto reader =
      FSEventReader::create(context, events, std::move(urls), since, FSEventReaderMode::pathBased,
                            Verbosity::verbose, eventScopeOf(container));
  return std::shared_ptr<FSChangesNotifier>(
      new FSChangesNotifier(context.platform, diagnostics, std::move(container), std::move(reader),
                            *deviceUUID, options));
}

FSChangesNotifier::FSChangesNotifier(const Platform& platform, DiagnosticReporter& diagnostics,
                                     std::string container, std::shared_ptr<FSEventReader> reader,
                                     const UUID& deviceUUID, Options options)
    : manager_(platform.manager),
      diagnostics_(diagnostics),
      options_(options),
      container_(std::move(container)),
      reader_(std::move(reader)),
      deviceUUID_(deviceUUID) {}

void FSChangesNotifier::didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>&,
                                      const URL&) {
  reader.streamQueue().assertOnQueue();
  shouldSignalChange_ = true;
}

void FSChangesNotifier::didDeleteItem(FSEventReader& reader, const std::string&,
                                      const std::optional<URL>&) {
  reader.streamQueue().assertOnQueue();
  shouldSignalChange_ = true;
}

void FSChangesNotifier::didFinishHistory(FSEventReader& reader) {
  reader.streamQueue().assertOnQueue();
}

void FSChangesNotifier::mustRestart(FSEventReader& reader) {
  reader.streamQueue().assertOnQueue();
  shouldSignalChange_ = true;
}

void FSChangesNotifier::didDropEvent(FSEventReader& reader, const FileSystemEvent&,
                                     const std::optional<URL>&, DropReason reason) {
  reader.streamQueue().assertOnQueue();
  // Something may have changed all the same, and a signal too many costs the host one question.
  if (reason == DropReason::lookFailed) shouldSignalChange_ = true;
}

void FSChangesNotifier::didProcessEvents(FSEventReader& reader) {
  reader.streamQueue().assertOnQueue();
  if (!std::exchange(shouldSignalChange_, false)) return;
  const std::string workingSet(VesselWorkingSetContainerItemIdentifier);
  if (container_ == workingSet) return notify({workingSet}, reader);
  notify({std::string(VesselRootContainerItemIdentifier), workingSet}, reader);
}

void FSChangesNotifier::notify(const std::vector<std::string>& containers,
                               const FSEventReader& reader) {
  const LogSection section(description() + " notifies changes on " + listOfTexts(containers));
  const std::string eventID = std::to_string(reader.lastProcessedFSEventID());
  DispatchGroup group;
  for (const std::string& target : containers) {
    group.enter();
    manager_.signalEnumeratorForContainerItemIdentifier(
        target, [group, target](const std::optional<Error>& error) mutable {
          if (error) {
            logError("can't signal changes for \"" + target + "\"; " + error->description());
          }
          group.leave();
        });
  }
  if (group.wait(options_.patience)) {
    logDebug("notified changes up to FSEventID " + eventID);
  } else {
    diagnostics_.report("notifying changes up to FSEventID " + eventID + " timed out");
  }
}

std::string FSChangesNotifier::description() const {
  return "<FSChangesNotifier:" + addressText(this) + " container:" + container_ +
         " reader:" + reader_->description() + ">";
}

}  // namespace mirabel
