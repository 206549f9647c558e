#pragma once

#include <string_view>

#include "foundation/Error.h"
#include "foundation/URL.h"
#include "foundation/Values.h"

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

/// Asks how many bytes a folder holds, its contents summed, links not followed. POSIX errors.
class DirectorySizer {
 public:
  virtual ~DirectorySizer() = default;
  [[nodiscard]] virtual Result<std::uint64_t> directorySize(const URL& folder) = 0;
};

/// Knows which history the identifiers and events of a volume belong to.
class VolumeHistory {
 public:
  virtual ~VolumeHistory() = default;
  /// Another value means that anchors and pages made before are void.
  [[nodiscard]] virtual Result<UUID> historyUUID(const URL& url) = 0;
};

}  // namespace mirabel
