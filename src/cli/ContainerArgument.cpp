#include "cli/ContainerArgument.h"

#include "cli/ItemArgument.h"

namespace mirabel {

Result<Container> ContainerArgument::container(const Session& session) const {
  if (text_ == "workingset") {
    return Container{std::string(VesselWorkingSetContainerItemIdentifier), {}};
  }
  if (text_ == "alldirs") {
    return Container{std::string(VesselAllDirectoriesContainerItemIdentifier), {}};
  }
  auto item = ItemArgument(text_).item(session);
  if (!item) return fail(item.error());
  return Container{(*item)->itemIdentifier(), (*item)->fileURL()};
}

Result<std::shared_ptr<VesselEnumerator>> ContainerArgument::enumerator(Session& session) const {
  auto found = container(session);
  if (!found) return fail(found.error());
  return session.enumerator(found->identifier);
}

}  // namespace mirabel
