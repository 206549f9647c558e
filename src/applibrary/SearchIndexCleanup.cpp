#include "applibrary/SearchIndexCleanup.h"

#include <memory>
#include <optional>
#include <semaphore>

#include "foundation/Log.h"
#include "fs/LogText.h"

namespace mirabel {
void deleteIndexOfDeletedAppLibraries(VesselManager& manager,
                                      const std::vector<std::string>& itemIdentifiers) {
  logDebug("asking provider manager to delete index from deleted domains");
  std::vector<std::string> domains;
  domains.reserve(itemIdentifiers.size());
  for (const std::string& identifier : itemIdentifiers)
    domains.push_back(identifier.substr(1));  // without its "#"
  // Shared with the handler, which may still be in `release` when the wait is over.
  const auto answered = std::make_shared<std::binary_semaphore>(0);
  manager.deleteSearchableItemsWithDomainIdentifiers(
      domains, [answered, domains](const std::optional<Error>& error) {
        if (error) {
          logError("can't delete searchable items from " + listOfTexts(domains) + "; " +
                   error->description());
        } else {
          logDebug(
              [&] { return "items from domains " + listOfTexts(domains) + " removed from index"; });
        }
        answered->release();
      });
  answered->acquire();
}

}  // namespace mirabel
