#pragma once

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/operations/FileCalls.h"
#include "linux/operations/PendingRecords.h"
#include "linux/volume/VolumeIndex.h"
#include "mirabel/Error.h"

namespace mirabel {

/// A hidden name for something that is to be removed if it is ever found.
struct TemporaryName {
  std::string name;
  PendingFolder folder;  ///< as it is on record
};

/// Keeps the record of what has to be cleared away or finished when the process is killed: the file
/// "pending" of the volume's state folder, which is replaced as a whole and is on disk before the
/// work begins. Hidden names of this process have a prefix that no other process has, so that a
/// folder is noted once for all of them, and stays noted for a while when it holds none any more.
/// Errors are POSIX errors. Any thread may call it.
class PendingWork {
 public:
  /// Both outlive it.
  PendingWork(VolumeIndex& index, const FileCalls& calls);

  /// Reads what processes before this one left; to be called first. A file that is damaged is set
  /// aside as "pending.damaged", and so is what is larger than any that was written; where it can't
  /// be read, no work is begun that would replace it.
  [[nodiscard]] PendingRecords load();
  /// What of that is still to be done, by a later start. The error is logged.
  [[nodiscard]] Result<void> settle(PendingRecords remaining);

  /// A name in the folder at `path`. The folder is on record from then on.
  [[nodiscard]] Result<TemporaryName> temporaryName(const std::string& path);
  /// Nothing has that name, nor will after a loss of power. Without this the folder is looked at by
  /// the next start.
  void isGone(const TemporaryName& temporary);
  /// A hidden name for something that is to be kept.
  [[nodiscard]] std::string hiddenName();
  [[nodiscard]] Result<PendingFolder> folderAt(const std::string& path);

  [[nodiscard]] Result<void> begin(const PendingMove& move);
  /// After an error the move is still on record.
  [[nodiscard]] Result<void> end(const PendingMove& move);
  [[nodiscard]] Result<void> begin(const PendingRename& rename);
  void end(const PendingRename& rename);

  /// Takes the folders of this process off the record but for those that may hold something. To be
  /// called when nothing runs any more.
  void close();

 private:
  /// A folder that holds or held something with this process's prefix.
  struct Removals {
    PendingFolder folder;
    std::size_t names = 0;  ///< that are not gone
  };
  [[nodiscard]] std::vector<Removals>::iterator removalsIn(const PendingFolder& folder);
  /// Takes folders off that hold nothing, the first noted first, until so many are left of them.
  void forgetUnused(std::size_t most);
  [[nodiscard]] Result<void> write();
  [[nodiscard]] std::string nextName(std::string_view prefix);

  VolumeIndex& index_;
  const FileCalls& calls_;
  std::mutex mutex_;
  std::string prefix_;
  std::uint64_t count_ = 0;
  std::vector<Removals> removals_;  ///< of this process, in the order in which they were noted
  std::vector<PendingMove> moves_;
  std::vector<PendingRename> renames_;
  PendingRecords before_;            ///< of those before it
  std::optional<Error> unreadable_;  ///< why they are not known
};

}  // namespace mirabel
