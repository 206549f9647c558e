#pragma once

#include <cerrno>

#include "mirabel/Error.h"

namespace mirabel {

/// Whether the failure says nothing of what is on the disk, so that nothing may be concluded.
[[nodiscard]] inline bool isPassing(const Error& error) {
  return error.isPosix(EMFILE) || error.isPosix(ENFILE) || error.isPosix(ENOMEM);
}

}  // namespace mirabel
