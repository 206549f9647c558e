#pragma once

#include <string>

#include "mirabel/Error.h"

namespace mirabel {

/// What the failure of a look at a place, or of opening it, says of what is there.
enum class LookFailure {
  absent,   ///< nothing, or something else than the path takes it for
  closed,   ///< something that is not ours: no permission, or a file system of its own
  passing,  ///< nothing at all: the next look may succeed, and no conclusion may be drawn
};

/// Of the document storage at `path`, which is there and can't be read: POSIX EACCES. A passing
/// failure, unlike those of the folders in it: the person has not put everything away.
[[nodiscard]] Error closedStorage(const std::string& path);

/// Any error that isn't known to say something of the place is a passing one.
[[nodiscard]] LookFailure lookFailure(const Error& error);

[[nodiscard]] inline bool saysAbsent(const Error& error) {
  return lookFailure(error) == LookFailure::absent;
}
/// Whether it says that the place is not, or no longer, one that is shown.
[[nodiscard]] inline bool saysOutOfReach(const Error& error) {
  return lookFailure(error) != LookFailure::passing;
}

}  // namespace mirabel
