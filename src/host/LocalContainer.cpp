#include "host/LocalContainer.h"

#include <cerrno>
#include <future>

#include "foundation/ResourceValues.h"
#include "host/ItemLookup.h"
#include "host/ItemRecords.h"

namespace mirabel {
namespace {

/// One page, as the enumerator hands it over.
class Page final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override {
    for (const auto& item : items)
      page.items.push_back(recordOf(*item));
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& nextPage) override {
    page.nextPage = nextPage;
  }
  void finishEnumeratingWithError(const Error& failure) override { error = failure; }

  ItemPage page;
  std::optional<Error> error;
};

/// One batch of changes, as the enumerator tells it.
class Batch final : public VesselChangeObserver {
 public:
  void didUpdateItems(const VesselItems& items) override {
    for (const auto& item : items)
      changes.updated.push_back(recordOf(*item));
  }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    changes.deleted.insert(changes.deleted.end(), identifiers.begin(), identifiers.end());
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data& anchor, bool moreComing) override {
    changes.anchor = anchor;
    changes.moreComing = moreComing;
    finished.set_value({});
  }
  void finishEnumeratingWithError(const Error& error) override { finished.set_value(fail(error)); }

  ItemChanges changes;
  std::promise<Result<void>> finished;
};

}  // namespace

Result<ItemChanges> changesSince(VesselEnumerator& enumerator, const Data& anchor) {
  const auto batch = std::make_shared<Batch>();
  auto finished = batch->finished.get_future();
  enumerator.enumerateChanges(batch, anchor);
  if (auto outcome = finished.get(); !outcome) return fail(outcome.error());
  return std::move(batch->changes);
}

Result<Data> currentAnchorOf(VesselEnumerator& enumerator) {
  std::optional<Data> anchor;
  enumerator.currentSyncAnchor([&](std::optional<Data> answer) { anchor = std::move(answer); });
  if (!anchor) return fail(Error::local(LocalVesselError::unableToGetDeviceUUID));
  return *std::move(anchor);
}

Error reasonFor(Error noAnchor, const HostedProvider& provider) {
  if (!noAnchor.is(LocalVesselError::unableToGetDeviceUUID)) return noAnchor;
  const auto event = provider.linuxPlatform().index().currentEventID();
  return event ? noAnchor : event.error();
}

Result<std::unique_ptr<LocalContainer>> LocalContainer::open(HostedProvider& provider,
                                                             std::string identifier) {
  std::unique_ptr<LocalContainer> container(new LocalContainer(provider, std::move(identifier)));
  if (auto enumerator = container->enumerator(); !enumerator) return fail(enumerator.error());
  return container;
}

LocalContainer::~LocalContainer() {
  invalidate();
}

void LocalContainer::invalidate() {
  if (enumerator_) enumerator_->invalidate();
  enumerator_.reset();
}

Result<std::optional<URL>> LocalContainer::placeOf(const HostedProvider& provider,
                                                   const std::string& identifier) {
  if (identifier == VesselWorkingSetContainerItemIdentifier ||
      identifier == VesselAllDirectoriesContainerItemIdentifier)
    return std::nullopt;
  const auto item = ItemLookup(provider).byIdentifier(identifier);
  if (!item) return fail(item.error());
  const URL& folder = (*item)->fileURL();
  const ResourceReader reader(provider.platform().resources);
  auto isFolder = reader.value(ResourceKey::isDirectory, folder);
  if (!isFolder) return fail(isFolder.error());
  auto isPackage = reader.value(ResourceKey::isPackage, folder);
  if (!isPackage) return fail(isPackage.error());
  if (*isFolder == ResourceValue(true) && *isPackage != ResourceValue(true)) return folder;
  // A folder that became a package is told as gone, though it is found by its number.
  if ((*item)->itemIdentifier() != identifier) return fail(Error::nonExistentItem(identifier));
  return fail(Error::posix(ENOTDIR));
}

Result<VesselEnumerator*> LocalContainer::enumerator() {
  auto place = placeOf(provider_, identifier_);
  if (!place) return fail(place.error());
  if (enumerator_ && *place == place_) return enumerator_.get();
  auto made =
      provider_.vessel().enumeratorForContainerItemIdentifier(identifier_, LiveUpdates::unwanted);
  if (!made) return fail(made.error());
  invalidate();
  place_ = *std::move(place);
  enumerator_ = *std::move(made);
  return enumerator_.get();
}

Result<ItemPage> LocalContainer::items(const Data& cursor) {
  const auto from = enumerator();
  if (!from) return fail(from.error());
  Page page;
  (*from)->enumerateItems(page, cursor);
  if (page.error) return fail(*std::move(page.error));
  return std::move(page.page);
}

Result<ItemChanges> LocalContainer::changes(const Data& anchor) {
  const auto from = enumerator();
  if (!from) return fail(from.error());
  return changesSince(**from, anchor);
}

Result<Data> LocalContainer::currentSyncAnchor() {
  const auto of = enumerator();
  if (!of) return fail(of.error());
  auto anchor = currentAnchorOf(**of);
  return anchor ? anchor : fail(reasonFor(anchor.error(), provider_));
}

}  // namespace mirabel
