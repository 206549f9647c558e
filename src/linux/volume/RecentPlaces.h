#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel {

/// A name under which an object may have turned up.
struct RecentPlace {
  std::string folderPath;
  std::string name;
};

/// Where names have changed since the index was last in step with the disk: while everything is
/// watched, folders that came since among it, an object that has left its place is at one of these,
/// or has left the roots.
class RecentPlaces {
 public:
  virtual ~RecentPlaces() = default;
  /// Whether everything is watched.
  [[nodiscard]] virtual bool isInStep() const = 0;
  /// Names that stand, or stood a moment ago, for an object with that inode number. Nothing when
  /// not everything is watched, and only a look everywhere will tell.
  /// Errors: `ErrorDomain::store`, and the passing ones of a look, see `LookFailure`.
  [[nodiscard]] virtual Result<std::optional<std::vector<RecentPlace>>> placesOf(
      std::uint64_t inode) = 0;
};

}  // namespace mirabel
