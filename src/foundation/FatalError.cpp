#include "foundation/FatalError.h"

#include <cstdlib>

#include "foundation/Log.h"

namespace mirabel {

void fatalError(std::string_view message) {
  logError(message);
  std::abort();
}

}  // namespace mirabel
