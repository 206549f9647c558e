#pragma once

#include <vector>

#include "foundation/URL.h"

namespace mirabel {

/// The document folders of the applications that expose theirs, in canonical form. Asked for
/// every identifier that is computed, from any thread, so answering must be cheap.
class AppLibraryRoots {
 public:
  virtual ~AppLibraryRoots() = default;
  [[nodiscard]] virtual std::vector<URL> rootURLsForAppLibraries() const = 0;
};

/// Where no applications are known.
class NoAppLibraryRoots final : public AppLibraryRoots {
 public:
  [[nodiscard]] std::vector<URL> rootURLsForAppLibraries() const override { return {}; }
};

}  // namespace mirabel
