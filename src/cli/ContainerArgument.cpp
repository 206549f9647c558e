#include "cli/ContainerArgument.h"

#include <cerrno>

#include "cli/ItemArgument.h"
#include "foundation/ResourceValues.h"

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

Result<Container> ContainerArgument::followed(const Session& session) const {
  auto found = container(session);
  if (!found || !found->folder) return found;
  const ResourceReader reader(session.platform().resources);
  auto isFolder = reader.value(ResourceKey::isDirectory, *found->folder);
  if (!isFolder) return fail(isFolder.error());
  if (*isFolder != ResourceValue(true)) return fail(Error::posix(ENOTDIR));
  return found;
}

Result<std::shared_ptr<VesselEnumerator>> ContainerArgument::enumerator(Session& session) const {
  auto found = followed(session);
  if (!found) return fail(found.error());
  return session.enumerator(found->identifier);
}

}  // namespace mirabel
