#pragma once

#include <string>

#include "mirabel/Error.h"

namespace mirabel {

/// What a file system keeps, of what lasting identities and user metadata need.
struct VolumeAbilities {
  /// Whether user extended attributes can be written; otherwise the POSIX error of trying.
  Result<void> userAttributes;
  bool hasBirthTimes = false;
  bool hasHandles = false;
  bool hasUUID = false;  ///< one of its own, not made up from its ID
};

/// Tries them on the file system that holds `folder`. What is tried leaves no name behind. POSIX
/// errors when the folder can't be looked at.
[[nodiscard]] Result<VolumeAbilities> volumeAbilities(const std::string& folder);

}  // namespace mirabel
