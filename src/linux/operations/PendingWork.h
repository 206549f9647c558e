#pragma once

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

/// Keeps the record of what has to be cleared away or finished when the process is killed: the file
/// "pending" of the volume's state folder, which is replaced as a whole and is on disk before the
/// work begins. Hidden names of this process have a prefix that no other process has, so that a
/// folder is noted once for all of them. Errors are POSIX errors. Any thread may call it.
class PendingWork {
 public:
  /// Both outlive it.
  PendingWork(VolumeIndex& index, const FileCalls& calls);

  /// Reads what processes before this one left; to be called first. A file that is damaged is set
  /// aside as "pending.damaged"; where it can't be read, no work is begun that would replace it.
  [[nodiscard]] PendingRecords load();
  /// What of that is still to be done, by a later start. The error is logged.
  [[nodiscard]] Result<void> settle(PendingRecords remaining);

  /// A hidden name in the folder at `path` for something that is to be removed if it is ever found.
  [[nodiscard]] Result<std::string> temporaryName(const std::string& path);
  /// A hidden name for something that is to be kept.
  [[nodiscard]] std::string hiddenName();
  [[nodiscard]] Result<PendingFolder> folderAt(const std::string& path);

  [[nodiscard]] Result<void> begin(const PendingMove& move);
  /// After an error the move is still on record.
  [[nodiscard]] Result<void> end(const PendingMove& move);
  [[nodiscard]] Result<void> begin(const PendingRename& rename);
  void end(const PendingRename& rename);

  /// Something of `temporaryName` could not be removed: its folder stays on record.
  void keepOnRecord(const std::string& path);
  /// Takes the folders of this process off the record but for those. To be called when nothing
  /// runs any more.
  void close();

 private:
  [[nodiscard]] Result<void> write();
  [[nodiscard]] std::string nextName(std::string_view prefix);

  VolumeIndex& index_;
  const FileCalls& calls_;
  std::mutex mutex_;
  std::string prefix_;
  std::uint64_t count_ = 0;
  PendingRecords records_;           ///< of this process
  PendingRecords before_;            ///< of those before it
  std::optional<Error> unreadable_;  ///< why they are not known
  std::vector<std::string> kept_;    ///< paths of folders that stay on record
};

}  // namespace mirabel
