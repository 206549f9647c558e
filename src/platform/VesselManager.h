#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/URL.h"
#include "mirabel/Containers.h"
#include "mirabel/Error.h"
#include "platform/DirectorySizer.h"
#include "platform/VolumeHistory.h"

namespace mirabel {

/// The identifier of a folder that is no container of the host's.
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
