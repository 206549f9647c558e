#pragma once

#include <cstdlib>

namespace mirabel {

/// Ends the process, which is how a fuzz target says that it found something.
inline void require(bool condition) {
  if (!condition) std::abort();
}

}  // namespace mirabel
