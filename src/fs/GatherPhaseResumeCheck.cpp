#include "fs/GatherPhaseResumeCheck.h"

#include <algorithm>
#include <mutex>
#include <semaphore>
#include <string_view>

#include "fs/FSEventReader.h"

namespace mirabel {
namespace {

using Case = FSEventReaderGatherPhaseResumeStatus::Case;

/// The reader's delegate for the time of the check. Written on the reader's queue and read by the
/// caller, who may do so while the rest of a batch is still coming in.
class FSEventChecker final : public FSEventReaderDelegate {
 public:
  FSEventChecker(const std::vector<URL>& folders, std::uint64_t previousEventID) {
    for (const URL& folder : folders)
      folders_.push_back(folder.properURL().path());
    check_.lastProcessedFSEventID = previousEventID;
  }

  GatherPhaseResumeCheck wait() {
    sema_.acquire();
    const std::lock_guard lock(mutex_);
    return check_;
  }

  void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                     const URL& url) override {
    reader.streamQueue().assertOnQueue();
    if (item->url().properURL() != url.properURL()) return noteLeft(item->vs_isContainer());
    // Saved by renaming, it may be at another place of its folder: on btrfs at its end.
    if ((reader.currentEvent()->flags & eventflag::changedObject) != 0) return noteLeft(false);
    // A folder is told of for each name that comes to it.
    if (!item->vs_isContainer()) return;
    const std::lock_guard lock(mutex_);
    check_.haveNamesChanged = true;
  }

  void didDeleteItem(FSEventReader& reader, const std::string& identifier,
                     const std::optional<URL>& url) override {
    const std::string place = url ? ", path:'" + url->path() + "'" : "";
    decide(reader, {Case::deletionOccurred, "[" + identifier + place + "]"});
  }

  void didFinishHistory(FSEventReader& reader) override { decide(reader, {}); }

  void mustRestart(FSEventReader& reader) override {
    decide(reader, {Case::cantReplayHistoricalFSEvents, {}});
  }

  void didProcessEvents(FSEventReader& reader) override { reader.streamQueue().assertOnQueue(); }

  void didDropEvent(FSEventReader& reader, const FileSystemEvent&, const std::optional<URL>& url,
                    DropReason reason) override {
    reader.streamQueue().assertOnQueue();
    if (reason == DropReason::hidden && isPassedOver(*url)) return;
    noteLeft(reason == DropReason::lookFailed || reason == DropReason::noPath);
  }

  /// Nothing will come: the answer must not wait for it.
  void didNotStart() {
    {
      const std::lock_guard lock(mutex_);
      check_.status.status = Case::cantReplayHistoricalFSEvents;
    }
    sema_.release();
  }

 private:
  void noteLeft(bool isFolder) {
    const std::lock_guard lock(mutex_);
    check_.haveNamesChanged = true;
    check_.hasNameLeft = true;
    check_.hasFolderMoved = check_.hasFolderMoved || isFolder;
  }

  /// Whether a walk never counts it, for a name on the way begins with a dot. What else is hidden
  /// is counted, such as an "Inbox", and shifts those behind it.
  [[nodiscard]] bool isPassedOver(const URL& url) const {
    constexpr std::string_view trash = "/.Trash/";
    const URL canonical = url.properURL();
    return std::ranges::all_of(folders_, [&](const std::string& folder) {
      std::string_view path = canonical.path();
      if (!path.starts_with(folder)) return true;
      path.remove_prefix(folder.size());
      if (path.starts_with(trash)) path.remove_prefix(trash.size() - 1);
      return path.contains("/.");
    });
  }

  /// The end of the history keeps what was found so far; the other answers replace it.
  void decide(FSEventReader& reader, FSEventReaderGatherPhaseResumeStatus status) {
    reader.streamQueue().assertOnQueue();
    {
      const std::lock_guard lock(mutex_);
      if (status.status != Case::canResume) check_.status = std::move(status);
      check_.lastProcessedFSEventID = reader.lastProcessedFSEventID();
    }
    // Submitted, so that the rest of the batch still comes here; the block keeps the reader.
    SerialQueue queue = reader.streamQueue();
    queue.async([stopped = reader.shared_from_this()] { stopped->stop(); });
    sema_.release();
  }

  std::vector<std::string> folders_;  // canonical paths
  std::mutex mutex_;
  GatherPhaseResumeCheck check_;
  std::counting_semaphore<> sema_{0};
};

}  // namespace

GatherPhaseResumeCheck canResumeGatherPhase(const ItemContext& context, EventStreams& events,
                                            const std::vector<URL>& on,
                                            std::uint64_t previousEventID) {
  const auto reader = FSEventReader::create(context, events, on, previousEventID,
                                            FSEventReaderMode::pathBased, Verbosity::quiet);
  const auto checker = std::make_shared<FSEventChecker>(on, previousEventID);
  reader->setDelegate(checker);
  SerialQueue queue = reader->streamQueue();
  // On this thread, which waits for it anyway: waking others costs as much as a short replay.
  queue.syncWithWhatFollows([&] {
    reader->start();
    if (!reader->isRunning()) checker->didNotStart();
  });
  GatherPhaseResumeCheck check = checker->wait();
  // Nothing of the check goes on behind the caller's back: the stop that was submitted is done.
  queue.sync([] {});
  return check;
}

}  // namespace mirabel
