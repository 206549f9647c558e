#pragma once

#include <cstdint>

#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Adds up folders. Any thread may call it.
class DirectorySizer {
 public:
  virtual ~DirectorySizer() = default;
  /// How many bytes the files below the folder hold, links not followed. POSIX errors.
  [[nodiscard]] virtual Result<std::uint64_t> directorySize(const URL& folder) = 0;
};

}  // namespace mirabel
