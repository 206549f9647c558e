#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "fs/ChangesEnumeration.h"
#include "fs/FSChangeToken.h"
#include "fs/FSEventReader.h"
#include "fs/RunningReaders.h"
#include "fs/ShownItems.h"
#include "identity/AppLibraryRoots.h"

namespace mirabel {

/// Where the path-based pass of a catch-up ended.
struct FSReaderState {
  std::uint64_t eventID = 0;
  std::uint64_t offset = 0;
  std::uint64_t numberOfChanges = 0;
};

/// Tells the changes of one container since an anchor, at most 100 a batch, in two passes over the
/// history: by path, then by document ID. What a record says is a place to look; whether a thing
/// is told as updated or deleted is decided by asking, at that moment, whether a fresh listing of
/// the container would hand it over. So looking twice, or late, changes nothing.
///
/// The anchors between batches say where both passes stand: `streamEventID` is where the document
/// pass does, and `offset`, marked by its top bit, how far ahead of it the path pass is. At the
/// end both stand at the last event there was when the enumeration was made, and `offset` is 0.
///
/// Lives on the queue of its reader, but for `start` and `stop`, which any thread may call. Kept
/// alive by whoever started it until it has finished.
class FSChangesEnumerator final : public ChangesEnumeration,
                                  public FSEventReaderDelegate,
                                  public std::enable_shared_from_this<FSChangesEnumerator> {
 public:
  /// References outlive it. An empty list of URLs is a programming error.
  FSChangesEnumerator(const ItemContext& context, EventStreams& events,
                      const AppLibraryRoots& roots, const FSChangeToken& token,
                      std::string container, std::vector<URL> urls,
                      std::shared_ptr<VesselChangeObserver> observer,
                      std::shared_ptr<RunningReaders> running);

  void start() override;
  void stop() override;

  void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                     const URL& url) override;
  void didDeleteItem(FSEventReader& reader, const std::string& identifier,
                     const std::optional<URL>& url) override;
  void didFinishHistory(FSEventReader& reader) override;
  void mustRestart(FSEventReader& reader) override;
  void didProcessEvents(FSEventReader& reader) override;
  void didDropEvent(FSEventReader& reader, const FileSystemEvent& event,
                    const std::optional<URL>& url, DropReason reason) override;

  static constexpr std::uint64_t changesPerBatch = 100;
  /// Set in the offset of an anchor of ours, so that the page of a listing is not taken for one.
  static constexpr std::uint64_t offsetMark = std::uint64_t{1} << 63;

 private:
  void startReader(FSEventReaderMode mode, std::uint64_t since);
  /// Whether the event is this pass's to tell of; ends the pass or the batch where it is not.
  [[nodiscard]] bool accepts(const FileSystemEvent& event);
  void endBatch();
  void finish(bool moreComing);
  void finishWithError(const Error& error);
  void stopReader();

  /// Tells what has become of the things that a record names.
  void settle(const FileSystemEvent& event);
  void settleIdentifier(const std::string& identifier, bool reportDeletion,
                        const std::optional<URL>& eventURL);
  /// Tells the package around a place that is not shown, when it is shown itself.
  void settlePackageAround(const URL& url);
  void forwardUpdate(const std::shared_ptr<LocalItem>& item, const URL& eventURL);
  void forwardDeletion(const std::string& identifier);
  [[nodiscard]] std::optional<std::string> reasonToIgnore(const LocalItem& item,
                                                          const URL& eventURL) const;
  [[nodiscard]] bool isFolderContainer() const;

  ItemContext context_;
  EventStreams& events_;
  FSChangeToken currentToken_;
  std::uint64_t numberOfChanges_ = 0;
  std::uint64_t numberOfReaderCaughtUp_ = 0;
  std::string container_;
  std::vector<URL> urls_;
  std::mutex mutex_;
  std::shared_ptr<FSEventReader> reader_;  // with mutex_
  std::shared_ptr<VesselChangeObserver> observer_;
  std::uint64_t sinceFSEventID_;
  const Result<std::uint64_t> startup_;  ///< up to which event this tells
  const std::uint64_t startupFSEventID_;
  std::optional<FSReaderState> pathBasedReaderState_;

  ShownItems shown_;
  std::shared_ptr<RunningReaders> running_;
  std::uint64_t passedEventID_;  ///< the last event that the pass under way is done with
  std::atomic<bool> isFinished_ = false;
  // What the batch tells: identifiers in the order in which they came up, and the item of each
  // that is updated; null for those that are deleted.
  std::vector<std::string> order_;
  std::map<std::string, std::shared_ptr<LocalItem>> changes_;
};

}  // namespace mirabel
