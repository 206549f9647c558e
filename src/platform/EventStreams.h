#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "foundation/SerialQueue.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"
#include "platform/FileObjects.h"

namespace mirabel {

/// Bits of `FileSystemEvent::flags` that say something of the stream itself.
namespace eventflag {
inline constexpr std::uint32_t mustScanSubdirectories = 0x01;
inline constexpr std::uint32_t userDropped = 0x02;
inline constexpr std::uint32_t kernelDropped = 0x04;
inline constexpr std::uint32_t eventIDsWrapped = 0x08;
inline constexpr std::uint32_t historyDone = 0x10;
/// Says of a path record that a folder became a package there, or stopped being one.
inline constexpr std::uint32_t changedKind = 0x100'0000;
/// Says of a path record that the document there passed to it from another object, as in a save by
/// renaming.
inline constexpr std::uint32_t changedObject = 0x200'0000;
}  // namespace eventflag

/// Bits of the flags that a stream is created with.
namespace streamflag {
inline constexpr std::uint32_t useContainerTypes = 0x01;
inline constexpr std::uint32_t fileEvents = 0x10;
inline constexpr std::uint32_t useExtendedData = 0x40;
}  // namespace streamflag

/// Something happened at a path: look there. Event IDs only grow in the life of a history, and an
/// event is on disk before anybody is told of it.
struct FileSystemEvent {
  std::uint64_t id = 0;
  std::uint32_t flags = 0;
  /// Absolute; for document records ".docid/changed/$docid/src=$src,dst=$dst", where dst is 0 for
  /// a document that is gone. Absent when the record holds none.
  std::optional<std::string> path;
  std::optional<std::uint64_t> fileID;
  /// The document that the object was when this happened; the index may have moved on since.
  std::optional<std::uint32_t> documentID;
};

/// A running subscription. Its callback runs on the dispatch queue, one batch at a time. After
/// `invalidate` has returned no further batch is submitted; one that was may still run.
class EventStream {
 public:
  virtual ~EventStream() = default;
  virtual void setDispatchQueue(SerialQueue queue) = 0;
  /// Delivers the history since the event ID at once, in batches, then one event with the flag
  /// `historyDone` and without a path, whose ID is the last one there is, then what comes.
  virtual void start() = 0;
  virtual void stop() = 0;
  virtual void invalidate() = 0;
};

/// The document folder of an application.
struct FollowedLibrary {
  URL folder;
  /// What else is shown of it, such as its display name: another one is told as a change of the
  /// folder.
  std::string label;
};

/// The persistent event history of the volume of the documents: of the document storage, and of
/// the libraries that are followed. Any thread may call it.
class EventStreams {
 public:
  virtual ~EventStreams() = default;
  using Callback = std::function<void(std::span<const FileSystemEvent>)>;

  /// Events at and below `paths`; "/" stands for all there are, also of libraries that are followed
  /// no more. A `since` that is no longer kept, or that this history never
  /// gave out, makes a first event with the flag `kernelDropped`. POSIX errors.
  [[nodiscard]] virtual Result<std::unique_ptr<EventStream>> createForPaths(
      std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds latency,
      std::uint32_t flags, Callback callback) = 0;
  /// The same for paths relative to a device; only "/.docid", its document records, is known.
  [[nodiscard]] virtual Result<std::unique_ptr<EventStream>> createRelativeToDevice(
      DeviceID device, std::vector<std::string> paths, std::uint64_t since,
      std::chrono::milliseconds latency, std::uint32_t flags, Callback callback) = 0;

  /// Follows these libraries, and no others, as they belong to that version of their list. What
  /// lies in one that comes is told as something that happened there, and so is what lay in one
  /// that goes, as gone. It stays like this in the next process. Saying the same again is cheap.
  /// What failed is tried again before an event ID is given out.
  [[nodiscard]] virtual Result<void> followLibraries(const std::vector<FollowedLibrary>& libraries,
                                                     std::uint64_t version) = 0;
  /// The event up to which the history told of the libraries of that version: whoever holds what
  /// they showed has to hear of everything after it. The largest number while there is no later
  /// version; 0 when it is not known any more.
  [[nodiscard]] virtual std::uint64_t lastEventIDUnder(std::uint64_t version) = 0;

  /// The latest event ID. Whatever a finished system call changed has an ID at or below it.
  /// POSIX and store errors where that can't be told.
  [[nodiscard]] virtual Result<std::uint64_t> currentEventID() = 0;
};

}  // namespace mirabel
