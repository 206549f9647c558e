#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/Error.h"
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

  using SignalHandler = std::function<void(std::optional<Error>)>;
  /// Tells the host that the container changed, so that it asks for the changes. The handler is
  /// called once, on any thread, perhaps before this returns, when the host has taken notice or
  /// refused.
  virtual void signalEnumeratorForContainerItemIdentifier(std::string_view container,
                                                          SignalHandler completionHandler) = 0;

  using DeletionHandler = std::function<void(std::optional<Error>)>;
  /// Has everything that was indexed under these domains taken out of the search index; a domain
  /// that has no entries is no error. The handler is called once, on any thread, perhaps before
  /// this returns, when that is done or failed.
  virtual void deleteSearchableItemsWithDomainIdentifiers(
      const std::vector<std::string>& domainIdentifiers, DeletionHandler completionHandler) = 0;
};

}  // namespace mirabel
