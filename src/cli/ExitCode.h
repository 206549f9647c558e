#pragma once

#include "mirabel/Error.h"

namespace mirabel {

/// What the program tells its caller when it ends.
enum class ExitCode : int {
  done = 0,
  failed = 1,
  usage = 2,
  noSuchItem = 3,
  startOver = 4,  ///< an anchor or a page that can't be used any more
  notPermitted = 5,
  nameTaken = 6,
  busy = 7,  ///< the service or the volume
};

/// The one place that turns errors into exit codes.
[[nodiscard]] ExitCode exitCodeFor(const Error& error);

/// A domain's name in error messages for programs.
[[nodiscard]] std::string_view domainName(ErrorDomain domain);

}  // namespace mirabel
