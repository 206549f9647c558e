#pragma once

#include <string_view>

#include "foundation/URL.h"
#include "platform/DirectorySizer.h"
#include "platform/VolumeHistory.h"

namespace mirabel {

/// Identifiers of the containers that are no files.
inline constexpr std::string_view VesselRootContainerItemIdentifier =
    "VesselRootContainerItemIdentifier";
inline constexpr std::string_view VesselWorkingSetContainerItemIdentifier =
    "VesselWorkingSetContainerItemIdentifier";
inline constexpr std::string_view VesselAllDirectoriesContainerItemIdentifier =
    "VesselAllDirectoriesContainerItemIdentifier";
inline constexpr std::string_view VesselTemporaryLocalFolderItemIdentifier =
    "VesselTemporaryLocalFolderItemIdentifier";

/// The host's default manager. Any thread may call it.
class VesselManager {
 public:
  virtual ~VesselManager() = default;
  /// The folder of the device's own documents: absolute, without symbolic links, the same for
  /// the life of the process.
  [[nodiscard]] virtual const URL& documentStorageURL() const = 0;
};

}  // namespace mirabel
