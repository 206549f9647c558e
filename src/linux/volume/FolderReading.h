#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "foundation/Error.h"
#include "linux/kernel/MonitoredRoots.h"
#include "linux/kernel/RawDirectory.h"
#include "linux/volume/VolumeIndex.h"
#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// A folder to be read, and the object that was seen there.
struct FolderRequest {
  std::string path;
  std::uint64_t id = 0;
  std::uint64_t inode = 0;
  std::int64_t birthTime = 0;
  bool wantsHandles = false;  ///< nothing is known of what lies in it
};

/// A folder that is being read.
struct FolderReading {
  UniqueFd folder;
  ObjectStatus status;                    ///< of itself, when reading it began
  std::optional<RawDirectory> directory;  ///< until the end was reached
  std::vector<Sighting> entries{};        ///< what was read last: those that are there, as they are
  [[nodiscard]] bool isAtEnd() const { return !directory; }
};

/// Begins to read an open folder, which was watched before. POSIX errors.
[[nodiscard]] Result<FolderReading> beginReading(UniqueFd folder);
/// Reads the next entries, one transaction's worth, and looks at them: on two threads where they
/// are many. POSIX errors.
[[nodiscard]] Result<void> readNext(FolderReading& reading);

/// Reads folders on another thread, each watched before it is read, while its owner takes the ones
/// before into the index. It opens a folder anew to find that it still is what was asked for; one
/// that is not, or that can't be read, is left to the owner, who finds out why. Used by one thread.
class FolderReadAhead {
 public:
  /// `roots` outlives it.
  explicit FolderReadAhead(const MonitoredRoots& roots);
  ~FolderReadAhead() { stop(); }
  FolderReadAhead(const FolderReadAhead&) = delete;
  FolderReadAhead& operator=(const FolderReadAhead&) = delete;

  struct Item;
  using Ticket = std::shared_ptr<Item>;
  /// `watcher` may be null: it is watched by nobody then.
  [[nodiscard]] Ticket ask(FolderRequest request, FolderWatcher* watcher);
  /// Nothing where it was not begun yet, which it is not any more then, or did not succeed.
  [[nodiscard]] std::optional<FolderReading> take(const Ticket& ticket);
  /// Drops what was not taken; returns when nothing is being read.
  void stop();

 private:
  struct Shared;
  void goOn();  // with the mutex
  std::shared_ptr<Shared> shared_;
};

}  // namespace mirabel
