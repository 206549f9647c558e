#include "items/LocalAppLibraryItem.h"

#include <utility>

#include "foundation/Log.h"
#include "identity/MRBFileObjectIdentifier.h"

namespace mirabel {

std::shared_ptr<LocalAppLibraryItem> LocalAppLibraryItem::create(const ItemContext& context,
                                                                 const BundleProxy& proxy) {
  if (!proxy.dataContainerURL) {
    logError("can't create an app library item without a data container URL");
    return nullptr;
  }
  struct Item final : LocalAppLibraryItem {
    Item(const ItemContext& itemContext, URL url)
        : LocalAppLibraryItem(itemContext, std::move(url)) {}
  };
  auto item =
      std::make_shared<Item>(context, proxy.dataContainerURL->appendingPathComponent("Documents"));
  ItemOverrides overrides;
  overrides.customItemID = MRBFileObjectIdentifier::fromBundleProxy(proxy);
  overrides.customParentItemID = VesselRootContainerItemIdentifier;
  overrides.customFilename = proxy.localizedName;
  overrides.hasBeaconDomainIdentifier = false;
  overrides.bundleIdentifier = proxy.bundleIdentifier;
  if (!item->build(std::move(overrides))) return nullptr;
  item->leaveOutHiddenEntries();
  return item;
}

void LocalAppLibraryItem::leaveOutHiddenEntries() {
  if (childItemCount().value_or(0) == 0) return;
  const ResourceReader reader(context_.platform.resources);
  for (const std::string_view name : {"Inbox", ".Trash"}) {
    const auto isThere =
        reader.value(ResourceKey::isReachable, fileURL().appendingPathComponent(name));
    if (!isThere || *isThere != ResourceValue(true)) continue;
    const std::uint16_t count = *childItemCount();
    // It came after the entries were counted. Whose folder this is could do so at any time, and
    // must not end the process; the count is told again for the change.
    if (count == 0) return;
    setChildItemCount(static_cast<std::uint16_t>(count - 1));
  }
}

std::string LocalAppLibraryItem::description() const {
  return describe("LocalAppLibraryItem");
}

}  // namespace mirabel
