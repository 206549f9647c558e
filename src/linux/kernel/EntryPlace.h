#pragma once

#include <string>

#include "linux/kernel/MonitoredRoots.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

class URL;

/// A name in a folder that is held open: how one object is looked at without a symbolic link on
/// the way being followed. Calls take `folder` and `name`; where `name` is empty, `folder` is the
/// object itself (a root, an object outside the roots, or one whose path ends in "." or "..").
struct EntryPlace {
  std::string folderPath;  ///< empty when `name` is
  UniqueFd folder;         ///< O_PATH
  std::string name;
};

/// POSIX errors: EINVAL for what is no file URL; ELOOP, ENOTDIR, EXDEV, ENOENT for the way there.
[[nodiscard]] Result<EntryPlace> placeOf(const MonitoredRoots& roots, const URL& url);

/// Opens the object at a place. O_NOFOLLOW, O_CLOEXEC, O_NONBLOCK and O_NOCTTY are added. A place
/// on which another file system is mounted opens as that file system's root. POSIX errors.
[[nodiscard]] Result<UniqueFd> openPlace(const EntryPlace& place, int flags);

}  // namespace mirabel
