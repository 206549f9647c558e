#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/SerialQueue.h"
#include "fs/FSEventReaderDelegate.h"
#include "fs/HiddenTest.h"
#include "fs/ItemLook.h"

namespace mirabel {

struct EventPlace;

enum class FSEventReaderMode { pathBased = 0, docIDBased = 1 };

enum class Verbosity { quiet, verbose };
/// Which events a reader hears of: those at and below its folders, or all there are, so that it is
/// told as well of what lay in folders that are its own no more.
enum class FSEventScope { folders, everything };
/// The containers that hold app libraries, which come and go, hear of everything.
[[nodiscard]] FSEventScope eventScopeOf(std::string_view container);

/// Replays the event history of monitored folders from an event ID and goes on with what happens,
/// turning each event into one call on its delegate. What happened to a thing is decided by
/// looking for it on the disk, not by the event. Made by its owner, who starts and stops it by
/// submitting that to `streamQueue`, and stops it before it lets go of it. Where nothing else is
/// said, members are for `streamQueue` only, or for the time before `start` was submitted.
class FSEventReader : public std::enable_shared_from_this<FSEventReader> {
 public:
  /// What `context` refers to and `events` outlive the reader. Any thread.
  [[nodiscard]] static std::shared_ptr<FSEventReader> create(
      const ItemContext& context, EventStreams& events, std::vector<URL> urls,
      std::uint64_t sinceFSEventID, FSEventReaderMode mode, Verbosity verbosity,
      FSEventScope scope = FSEventScope::folders);
  ~FSEventReader();
  FSEventReader(const FSEventReader&) = delete;
  FSEventReader& operator=(const FSEventReader&) = delete;

  /// The ID of the event history that `url` belongs to; nothing when it cannot be had. Any thread.
  [[nodiscard]] static std::optional<UUID> volumeUUID(const Platform& platform, const URL& url);

  /// Subscribes. When that fails an error line is logged, nothing will ever be delivered, and
  /// `isRunning` stays false.
  void start();
  /// Ends the subscription and lets go of the delegate.
  void stop();
  /// For the delegate, while it is told of an event: it has heard enough. The rest of the history
  /// is neither read nor looked at, and nothing further is told. `stop` is still to come.
  void endTelling();
  [[nodiscard]] bool isRunning() const { return stream_ != nullptr; }

  void setDelegate(std::weak_ptr<FSEventReaderDelegate> delegate);

  /// Any thread; a copy is the same queue.
  [[nodiscard]] const SerialQueue& streamQueue() const { return streamQueue_; }
  /// The highest event ID handled so far, or the one that it was created with.
  [[nodiscard]] std::uint64_t lastProcessedFSEventID() const { return lastProcessedFSEventID_; }
  [[nodiscard]] const std::vector<URL>& urls() const { return urls_; }
  [[nodiscard]] FSEventReaderMode mode() const { return mode_; }
  [[nodiscard]] const HiddenTest& hiddenTest() const { return hiddenTest_; }

  /// The event that the delegate is being told of; null between events.
  [[nodiscard]] const FileSystemEvent* currentEvent() const { return currentEvent_; }
  /// Why its item cannot be told, while `didDropEvent` says `lookFailed`.
  [[nodiscard]] const std::optional<Error>& lookError() const { return lookError_; }

  /// For log lines.
  [[nodiscard]] std::string description() const;

 private:
  using ItemResult = Result<std::shared_ptr<LocalItem>>;

  FSEventReader(const ItemContext& context, EventStreams& events, std::vector<URL> urls,
                std::uint64_t sinceFSEventID, FSEventReaderMode mode, Verbosity verbosity,
                FSEventScope scope);

  [[nodiscard]] Result<std::unique_ptr<EventStream>> createStream();
  [[nodiscard]] std::vector<std::string> streamPaths() const;
  void processBatch(std::span<const FileSystemEvent> events);
  void process(std::size_t index, const FileSystemEvent& event, const EventPlace& place);
  [[nodiscard]] bool processStreamFlags(const FileSystemEvent& event);
  void processPath(const FileSystemEvent& event, const EventPlace& place);
  void processDocument(const FileSystemEvent& event, const EventPlace& place);
  [[nodiscard]] ItemResult itemOf(const FileSystemEvent& event, const URL& url) const;

  void tellUpdate(const std::shared_ptr<LocalItem>& item, const URL& url);
  void tellDeletion(const std::string& identifier, const std::optional<URL>& url);
  void tellDrop(const FileSystemEvent& event, const std::optional<URL>& url, DropReason reason);
  void tellFailure(const FileSystemEvent& event, const std::optional<URL>& url, const Error& error);
  template <class Build>
  void logWhenVerbose(Build&& build) const;

  ItemContext context_;
  EventStreams& events_;
  std::unique_ptr<EventStream> stream_;
  SerialQueue streamQueue_;
  std::uint64_t lastProcessedFSEventID_;
  std::vector<URL> urls_;
  FSEventReaderMode mode_;
  Verbosity verbosity_;
  FSEventScope scope_;
  std::weak_ptr<FSEventReaderDelegate> delegate_;
  bool hasToldEnough_ = false;
  HiddenTest hiddenTest_;
  ItemLook look_;
  const FileSystemEvent* currentEvent_ = nullptr;
  std::optional<Error> lookError_;
};

}  // namespace mirabel
