#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include "linux/volume/FolderReading.h"
#include "linux/volume/IndexContext.h"
#include "linux/volume/MissingNames.h"
#include "linux/watch/FolderWatcher.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Compares folders of the index with the disk, by a look at every entry, and takes the
/// differences in. Each folder is watched from before it is read, so that what happens to it
/// afterwards is heard of. Folders that can't be read hold nothing. Used under the lock of the
/// index.
class TreeScan {
 public:
  TreeScan(const IndexContext& context, MissingNames& missing)
      : context_(context), missing_(missing) {}

  /// Null: nobody watches.
  void setWatcher(FolderWatcher* watcher) { watcher_ = watcher; }

  enum class Depth {
    everything,  ///< all folders below
    folder,      ///< the folder itself, and folders in it that nobody watches
  };
  void add(std::string path, std::uint64_t id, Depth depth);
  [[nodiscard]] Result<void> addRoots();
  /// One that is not there is noted as missing, with all that it held.
  [[nodiscard]] Result<void> addRoot(const std::string& path);
  [[nodiscard]] bool isEmpty() const { return pending_.empty(); }
  void clear();

  /// Goes through what was added. When it returns without an error, the index shows what the disk
  /// showed at some moment since the call, for each entry that did not change meanwhile; names
  /// that are missing are still to be settled. An error leaves what was taken in.
  /// `pause` is called every so many entries.
  [[nodiscard]] Result<void> run(const Transaction& transaction, const Pause& pause);

  /// Looks at the closed folders that could not be watched, for no record tells that something came
  /// into one of them or left, which shows in its dates.
  [[nodiscard]] Result<void> lookAtUnheard();
  [[nodiscard]] bool hasUnheard() const { return !unheard_.empty(); }

  /// Whether that folder was gone through since the last `clear`.
  [[nodiscard]] bool hasRead(std::uint64_t id) const { return read_.contains(id); }
  [[nodiscard]] std::size_t foldersRead() const { return read_.size(); }
  /// Folders that went away, or changed places, before they were read to the end, since the last
  /// call: their paths are to be found out again.
  [[nodiscard]] std::vector<std::uint64_t> takeDisturbed() { return std::exchange(disturbed_, {}); }
  [[nodiscard]] bool wasDisturbed() const { return !disturbed_.empty(); }
  /// Set when the kernel refused to watch a folder that can be read.
  [[nodiscard]] const std::optional<Error>& watchFailure() const { return watchFailure_; }
  /// How many folders could not be read when they were looked into last, and are still there.
  [[nodiscard]] std::size_t unreadableFolders() const;

 private:
  struct Folder {
    std::string path;
    std::uint64_t id;
    Depth depth;
  };
  [[nodiscard]] Result<void> readBatch(const Pause& pause);
  [[nodiscard]] Result<void> read(const Folder& folder);
  /// Takes in that the folder can't be read, and so holds nothing.
  [[nodiscard]] Result<void> passOver(const Folder& folder);
  [[nodiscard]] Result<void> awaitOpening(const Folder& folder);
  [[nodiscard]] Result<void> giveUp(const Folder& folder, const Error& error);
  [[nodiscard]] Result<void> takeIn(const Folder& folder, FolderReading reading);
  [[nodiscard]] Result<void> takeInEntries(const Folder& folder, FolderReading& reading);
  [[nodiscard]] Result<std::uint64_t> takeInBatch(const Folder& folder, FolderReading& reading);
  [[nodiscard]] Result<void> findMissing(const Folder& folder);
  [[nodiscard]] Result<void> lookAtItself(const Folder& folder, const ObjectStatus& status);
  /// False when it is nowhere any more.
  [[nodiscard]] Result<bool> lookAtUnheard(std::uint64_t id);
  void watch(int folder, std::uint64_t id);

  const IndexContext& context_;
  MissingNames& missing_;
  FolderWatcher* watcher_ = nullptr;
  std::vector<Folder> pending_;
  std::unordered_set<std::uint64_t> read_;
  std::size_t entriesRead_ = 0;  // in the transaction under way
  std::vector<std::uint64_t> disturbed_;
  // Folders that could not be read, and how many there are in and at each.
  std::unordered_map<std::uint64_t, std::size_t> unreadable_;
  std::unordered_set<std::uint64_t> unheard_;
  std::optional<Error> watchFailure_;
};

}  // namespace mirabel
