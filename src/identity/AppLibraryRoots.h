#pragma once

#include <memory>
#include <vector>

#include "foundation/URL.h"

namespace mirabel {

/// The document folders of the applications that expose theirs. Asked for
/// every identifier that is computed, from any thread, so answering must be cheap: an
/// implementation keeps the list and replaces it as a whole when it changes.
class AppLibraryRoots {
 public:
  using List = std::shared_ptr<const std::vector<URL>>;

  virtual ~AppLibraryRoots() = default;
  /// In canonical form: to compare with, not to be opened. Never null.
  [[nodiscard]] virtual List rootURLsForAppLibraries() const = 0;
  /// The same folders as they can be opened, in the same order.
  [[nodiscard]] virtual std::vector<URL> folders() const = 0;
};

/// Where no applications are known.
class NoAppLibraryRoots final : public AppLibraryRoots {
 public:
  [[nodiscard]] List rootURLsForAppLibraries() const override { return none_; }
  [[nodiscard]] std::vector<URL> folders() const override { return {}; }

 private:
  List none_ = std::make_shared<const std::vector<URL>>();
};

}  // namespace mirabel
