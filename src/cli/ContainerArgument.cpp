#include "cli/ContainerArgument.h"

#include "cli/ItemArgument.h"
#include "platform/VesselManager.h"

namespace mirabel {

Result<std::string> ContainerArgument::identifier(Documents& documents) const {
  if (text_ == "workingset") return std::string(VesselWorkingSetContainerItemIdentifier);
  if (text_ == "alldirs") return std::string(VesselAllDirectoriesContainerItemIdentifier);
  auto item = ItemArgument(text_).item(documents);
  if (!item) return fail(item.error());
  return std::move(item->itemIdentifier);
}

}  // namespace mirabel
