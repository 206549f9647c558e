#include "host/HostTrash.h"

#include <utility>

namespace mirabel {

void HostTrash::trash(std::string_view identifier, const std::optional<URL>& place,
                      LocalVessel::ItemHandler completionHandler) {
  const auto item = provider_.lookUpItem(identifier, place);
  // What is in the trash came from elsewhere.
  const bool isRemembered = item && item->fileID() && !item->isTrashed();
  if (!isRemembered)
    return provider_.trashItemWithIdentifier(identifier, std::move(completionHandler), place);
  const std::uint64_t fileID = *item->fileID();
  auto remembered = origins_.remember(fileID, {item->parentItemIdentifier(), item->filename()});
  // Better left where it is than not to be put back.
  if (!remembered) return completionHandler(fail(remembered.error()));
  provider_.trashItemWithIdentifier(
      identifier,
      [this, fileID, place, identifier = std::string(identifier),
       done = std::move(completionHandler)](auto result) {
        // An error may come after the move; what is remembered for nothing does no harm.
        const auto left = result ? nullptr : provider_.lookUpItem(identifier, place);
        if (left && !left->isTrashed()) origins_.forget(fileID);
        done(std::move(result));
      },
      place);
}

void HostTrash::restore(std::string_view identifier, const std::optional<URL>& place,
                        std::optional<std::string> toParentItemIdentifier,
                        LocalVessel::ItemHandler completionHandler) {
  const auto item = provider_.lookUpItem(identifier, place);
  const auto fileID = item ? item->fileID() : std::nullopt;
  const auto origin = fileID ? origins_.find(*fileID) : std::nullopt;
  if (!origin) {
    return provider_.untrashItemWithIdentifier(identifier, toParentItemIdentifier,
                                               std::move(completionHandler), {}, place);
  }
  if (!toParentItemIdentifier || !provider_.untrashParent(*toParentItemIdentifier)) {
    toParentItemIdentifier = origin->parentItemIdentifier;
  }
  provider_.untrashItemWithIdentifier(
      identifier, toParentItemIdentifier,
      [this, fileID, done = std::move(completionHandler)](auto result) {
        if (result) origins_.forget(*fileID);
        done(std::move(result));
      },
      origin->filename, place);
}

}  // namespace mirabel
