#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/ResourceValues.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

inline constexpr std::int64_t nanosecondsPerSecond = 1'000'000'000;

/// What one statx tells of an object. Times are nanoseconds since 1970 in UTC where they are used
/// to tell objects apart, so that comparing them is one comparison; far dates saturate.
struct ObjectStatus {
  std::uint64_t inode = 0;
  std::uint64_t device = 0;  ///< makedev number of the file system (of the subvolume on btrfs)
  FileKind kind = FileKind::other;
  std::uint16_t mode = 0;
  std::uint32_t owner = 0;
  std::uint32_t linkCount = 0;
  std::uint64_t size = 0;
  std::uint64_t attributes = 0;  ///< STATX_ATTR_… bits that are set
  bool hasBirthTime = false;
  std::int64_t birthTime = 0;
  std::int64_t changeTime = 0;
  std::int64_t modificationTime = 0;
  /// When it was looked at, on the clock that stamps files and not later than the look.
  std::int64_t seenAt = 0;
};

/// Looks at `name` in the folder `directory`; an empty name looks at the descriptor itself. A
/// final symbolic link is not followed, nothing is opened, no automount is set off. POSIX errors;
/// EXDEV for a mount that is dead, which can't be entered any more than another.
[[nodiscard]] Result<ObjectStatus> statusAt(int directory, const std::string& name);
/// The same for an absolute path of any length, also beyond PATH_MAX.
[[nodiscard]] Result<ObjectStatus> statusOf(const std::string& path);
/// What an absolute path shorter than PATH_MAX leads to: symbolic links are followed, the final one
/// too.
[[nodiscard]] Result<ObjectStatus> statusOfTarget(const std::string& path);

/// The kernel's handle of an object: bytes that name it among all objects, of now and of before,
/// on its file system. Starts with the handle's type. Nothing where the file system has none.
[[nodiscard]] std::optional<std::string> handleAt(int directory, const std::string& name);

/// Whether whatever changes after a look at `seenAt` is sure to get another change time.
[[nodiscard]] bool isSettled(std::int64_t changeTime, std::int64_t seenAt);
/// Whether the time is one of a file system that stamps whole seconds, or hundredths of them. Of
/// another one such a time is rare, and taking it for one costs a little time.
[[nodiscard]] bool isCoarseStamp(std::int64_t time);
/// Whether the file system of an open object may leave the same times after two changes within a
/// tick of the clock, also when the object was looked at in between: all of them on kernels before
/// 6.13, and most later on.
[[nodiscard]] bool timesAreCoarse(int object);

/// Numbers in a handle, one of which is the inode number of its object on the file systems there
/// are: where to look for what has that handle.
[[nodiscard]] std::vector<std::uint64_t> inodesIn(std::string_view handle);

Date dateFromNanoseconds(std::int64_t nanoseconds);

}  // namespace mirabel
