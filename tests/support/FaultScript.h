#pragma once

#include <array>
#include <cstddef>
#include <mutex>
#include <optional>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel::testing {

/// What can be asked of a platform, one value per call that can fail.
enum class Op {
  readValues,
  prefetch,
  attributeNames,
  attributeSize,
  attributeRead,
  attributeOpen,
  attributeSet,
  attributeRemove,
  openObject,
  device,
  attributes,
  status,
  pathOfFileID,
  pathsOfFileID,
  permanentStorage,
  permanentStorageForItemAtURL,
  fileIDOfDocument,
  openDirectory,
  nextEntry,
  closeDirectory,
  directorySize,
  createDirectory,
  importUnderFolder,
  createSubFolder,
  renameWithNewName,
  reparentUnderFolder,
  trashUnderFolder,
  deleteItem,
  readWriteAccess,
  keepPosition,
  enumerateApplications,
  infoDictionary,
  cacheRead,
  cacheFolder,
  cacheReplace,
  claimVersion,
  historyUUID,
};

/// Counts the calls of each operation and decides which of them fail. Thread-safe.
class FaultScript {
 public:
  /// Of the calls of `op` from now on, fails number `first` (from 1) and the `count - 1` after it.
  void fail(Op op, Error error, std::size_t first = 1, std::size_t count = 1);
  /// Of all calls from now on, fails number `first` (from 1).
  void failCall(std::size_t first, Error error);
  /// Forgets what was scripted and counted.
  void reset();

  [[nodiscard]] std::size_t calls(Op op) const;
  [[nodiscard]] std::size_t calls() const;

  /// Counts a call; the error that it has to fail with.
  std::optional<Error> hit(Op op);

 private:
  struct Fault {
    std::optional<Op> op;
    std::size_t first;
    std::size_t end;
    Error error;
  };
  [[nodiscard]] std::size_t counted(std::optional<Op> op) const;

  mutable std::mutex mutex_;
  std::array<std::size_t, static_cast<std::size_t>(Op::historyUUID) + 1> counts_{};
  std::vector<Fault> faults_;
};

}  // namespace mirabel::testing
