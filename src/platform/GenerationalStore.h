#pragma once

#include <cstdint>

#include "platform/FileObjects.h"

namespace mirabel {

enum class Allocation { ifNone, never };

/// Document IDs: 32-bit numbers that stay with a document through renames, moves and atomic
/// saves, and are never given to another. An ID that was answered is on disk. Any thread may
/// call it.
class GenerationalStore {
 public:
  virtual ~GenerationalStore() = default;
  /// The object's document ID, allocated now if it has none. POSIX errors.
  [[nodiscard]] virtual Result<std::uint32_t> permanentStorage(FileObject& object) = 0;
  /// The same by place; 0 with `Allocation::never` when it has none.
  [[nodiscard]] virtual Result<std::uint32_t> permanentStorageForItemAtURL(
      const URL& url, Allocation allocation) = 0;
  /// The file ID that holds the document now. POSIX errors: ENOENT when there is none; EAGAIN,
  /// EBUSY and ESTALE when asking again soon may help.
  [[nodiscard]] virtual Result<std::uint64_t> fileIDOfDocument(DeviceID device,
                                                               std::int64_t documentID) = 0;
};

}  // namespace mirabel
