#pragma once

#include <string_view>
#include <vector>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"

namespace mirabel {

/// The one answer to what is shown of the monitored folders; listings and changes both ask it, so
/// that they agree. Only what stands below a monitored folder counts: the folder itself may lie
/// behind hidden names, and is shown. Hidden are
///  - names that begin with "." and everything below them, but for what lies directly in a
///    ".Trash" that lies directly in a monitored folder;
///  - what is named "Inbox", and everything in it;
///  - what lies inside a package, though not the package itself.
/// Paths are compared by components, in canonical form. Any thread may call it.
class HiddenTest {
 public:
  /// `resources` outlives this.
  HiddenTest(const std::vector<URL>& folders, ResourceValueSource& resources);

  /// Whether the URL is one of the folders or lies below one, in sight or not.
  [[nodiscard]] bool isMonitored(const URL& url) const;
  /// True as well for what is not monitored. Reads those folders between the monitored one and the
  /// URL whose names may be a package's, through their resource caches; one that cannot be read is
  /// taken for no package.
  [[nodiscard]] bool isHidden(const URL& url) const;

 private:
  [[nodiscard]] bool isHiddenBelow(std::string_view relative, const URL& url) const;
  [[nodiscard]] bool isPackage(const URL& folder) const;

  std::vector<URL> folders_;  // canonical
  ResourceReader reader_;
};

}  // namespace mirabel
