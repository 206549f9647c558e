#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Number of a volume; 0 is none.
using DeviceID = std::uint32_t;

/// What an open object tells of itself.
struct ObjectAttributes {
  FileKind kind = FileKind::other;
  std::uint32_t documentID = 0;  ///< 0: none assigned yet
  std::uint64_t fileID = 0;
};

/// An object that is open for looking at it only: opening never blocks (a FIFO neither), never
/// follows a final symbolic link and needs no permission on the object itself. Closed by its
/// destructor; used by one thread at a time.
class FileObject {
 public:
  virtual ~FileObject() = default;
  /// Errors are POSIX errors.
  [[nodiscard]] virtual Result<DeviceID> device() = 0;
  [[nodiscard]] virtual Result<ObjectAttributes> attributes() = 0;
};

/// What `status` tells of a path.
struct FileStatus {
  std::uint64_t fileID = 0;
  /// For a folder 2 + the number of its entries, at most 65,535; 2 for one that is not ours to
  /// read.
  std::uint16_t linkCount = 0;
};

/// Objects of the file system by path and by file ID. Any thread may call it.
class FileObjects {
 public:
  virtual ~FileObjects() = default;
  /// POSIX error ENOENT where nothing is there.
  [[nodiscard]] virtual Result<std::unique_ptr<FileObject>> open(const URL& url) = 0;
  /// Answers from the URL's resource cache what that already knows. Where the entries of a folder
  /// can't be counted for the moment, it fails.
  [[nodiscard]] virtual Result<FileStatus> status(const URL& url) = 0;
  /// Where the object lies now, checked against the disk before it is answered. POSIX error
  /// ENOENT when no object of that ID is to be found in the monitored folders; no object has the
  /// ID 0 or one of 2^63 and more.
  [[nodiscard]] virtual Result<std::string> pathOfFileID(DeviceID device, std::uint64_t fileID) = 0;
  /// Every path below the monitored folders that the object is known to have, in no order: several
  /// for one that has hard links. Each is checked against the disk. A name that came since the
  /// volume was last compared with the disk may be missing, and comes with an event. Empty where
  /// `pathOfFileID` says ENOENT.
  [[nodiscard]] virtual Result<std::vector<std::string>> pathsOfFileID(DeviceID device,
                                                                       std::uint64_t fileID) = 0;
};

}  // namespace mirabel
