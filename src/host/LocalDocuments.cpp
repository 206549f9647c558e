#include "host/LocalDocuments.h"

#include <utility>

#include "host/ItemFile.h"
#include "host/ItemRecords.h"
#include "host/LocalContainer.h"
#include "host/ProviderStatus.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {
namespace {

LocalVessel::ItemHandler recorded(Documents::ItemHandler handler) {
  return [handler = std::move(handler)](LocalVessel::ItemResult result) {
    if (!result) return handler(fail(std::move(result).error()));
    handler(recordOf(**result));
  };
}

/// For what gives an item a name or a place: it is looked at when that is done, and may not be
/// shown there. The code alone would say that nothing had happened.
LocalVessel::ItemHandler recordedWhenDone(Documents::ItemHandler handler) {
  return recorded([handler = std::move(handler)](Documents::ItemResult result) {
    if (!result && result.error().is(LocalVesselError::invalidItemIdentifier)) {
      result.error().userInfo[std::string(errorkey::detail)] =
          "it was done, but under that name it is not shown";
    }
    handler(std::move(result));
  });
}

std::optional<URL> placeOf(const ItemTarget& item) {
  if (item.path.empty()) return {};
  return URL::fileURL(item.path);
}

}  // namespace

Result<std::unique_ptr<LocalDocuments>> LocalDocuments::open(LinuxPlatform::Options options) {
  auto provider = HostedProvider::open(std::move(options));
  if (!provider) return fail(provider.error());
  return std::unique_ptr<LocalDocuments>(new LocalDocuments(*std::move(provider)));
}

LocalDocuments::LocalDocuments(std::unique_ptr<HostedProvider> provider)
    : provider_(std::move(provider)),
      lookup_(*provider_),
      recent_(lookup_, provider_->linuxPlatform().index(),
              provider_->platform().manager.documentStorageURL().path()),
      searching_(*provider_) {}

void LocalDocuments::releaseMemory() {
  provider_->searchableItems().releaseMemory();
  // The last, for it has the allocator give back what all of them freed.
  provider_->linuxPlatform().index().releaseMemory();
}

Documents::ItemResult LocalDocuments::item(std::string_view identifier) {
  return recent_.item(identifier);
}

Documents::ItemResult LocalDocuments::itemAtPath(const std::string& path) {
  const auto item = lookup_.atPath(path);
  if (!item) return fail(item.error());
  return recordOf(**item);
}

Result<std::unique_ptr<DocumentContainer>> LocalDocuments::container(std::string_view identifier) {
  return LocalContainer::open(*provider_, std::string(identifier));
}

ContainerWatches& LocalDocuments::watches() {
  std::call_once(watching_, [this] {
    watches_ = std::make_unique<ContainerWatches>(*provider_);
    provider_->watchApplications();
  });
  return *watches_;
}

Result<std::unique_ptr<ContainerWatch>> LocalDocuments::watch(std::string_view identifier,
                                                              std::function<void()> changed) {
  return watches().add(std::string(identifier), std::move(changed));
}

Result<UniqueFd> LocalDocuments::openFile(std::string_view identifier, Access access) {
  return openItemFile(lookup_, identifier, access);
}

void LocalDocuments::importDocument(const std::string& source, const std::string& parent,
                                    ItemHandler handler) {
  provider_->vessel().importDocumentAtURL(URL::fileURL(source), parent,
                                          recordedWhenDone(std::move(handler)));
}

void LocalDocuments::createDirectory(const std::string& name, const std::string& parent,
                                     ItemHandler handler) {
  provider_->vessel().createDirectoryWithName(name, parent, recordedWhenDone(std::move(handler)));
}

void LocalDocuments::rename(const ItemTarget& item, const std::string& name, ItemHandler handler) {
  provider_->vessel().renameItemWithIdentifier(item.itemIdentifier, name,
                                               recordedWhenDone(std::move(handler)), placeOf(item));
}

void LocalDocuments::reparent(const ItemTarget& item, const std::string& parent,
                              const std::optional<std::string>& newName, ItemHandler handler) {
  provider_->vessel().reparentItemWithIdentifier(
      item.itemIdentifier, parent, newName, recordedWhenDone(std::move(handler)), placeOf(item));
}

void LocalDocuments::remove(const ItemTarget& item, ErrorHandler handler) {
  provider_->vessel().deleteItemWithIdentifier(item.itemIdentifier, std::move(handler),
                                               placeOf(item));
}

void LocalDocuments::trash(const ItemTarget& item, ItemHandler handler) {
  provider_->trash().trash(item.itemIdentifier, placeOf(item),
                           recordedWhenDone(std::move(handler)));
}

void LocalDocuments::restore(const ItemTarget& item, const std::optional<std::string>& parent,
                             ItemHandler handler) {
  provider_->trash().restore(item.itemIdentifier, placeOf(item), parent,
                             recordedWhenDone(std::move(handler)));
}

void LocalDocuments::setLastUsedDate(const std::string& identifier, const std::optional<Date>& date,
                                     ItemHandler handler) {
  provider_->vessel().setLastUsedDate(date, identifier, recorded(std::move(handler)));
}

void LocalDocuments::setTagData(const std::string& identifier, const std::optional<Data>& tagData,
                                ItemHandler handler) {
  provider_->vessel().setTagData(tagData, identifier, recorded(std::move(handler)));
}

void LocalDocuments::setFavoriteRank(const std::string& identifier,
                                     const std::optional<Number>& rank, ItemHandler handler) {
  provider_->vessel().setFavoriteRank(rank, identifier, recorded(std::move(handler)));
}

Result<TrashFindings> LocalDocuments::itemsTrashedBefore(const Date& date) {
  TrashFindings found;
  const LocalVessel& vessel = provider_->vessel();
  vessel.forEachTrashedEntry([&](const LocalVessel::TrashedEntry& entry) {
    if (!entry.trashDate || !*entry.trashDate) {
      ++found.undated;
    } else if (**entry.trashDate < date) {
      found.old.push_back({vessel.persistentIdentifierForItemAtURL(entry.url), entry.url.path(),
                           **entry.trashDate});
    }
  });
  return found;
}

void LocalDocuments::removeItemsTrashedBefore(const Date& date, ErrorHandler handler) {
  provider_->vessel()._removeTrashedItemsOlderThanDate(date, std::move(handler));
}

Progress LocalDocuments::progress() {
  const OperationProgress& progress = provider_->linuxPlatform().progress();
  return {progress.entriesCopied, progress.bytesCopied, progress.entriesRemoved};
}

Result<std::vector<ItemRecord>> LocalDocuments::appLibraries() {
  return recordsOf(provider_->libraries().shared().appLibraries());
}

std::string LocalDocuments::whyNoContainer(const std::string& bundle) const {
  if (auto reason = lookup_.reasonLeftOut(bundle)) return *std::move(reason);
  const bool isKnown =
      provider_->platform().applications.proxyForBundleIdentifier(bundle).has_value();
  return isKnown ? "the application has no folder for documents"
                 : "no application has this identifier";
}

Result<ApplicationContainer> LocalDocuments::applicationContainer(const std::string& bundle) {
  LocalVessel::ItemResult item = fail(Error::nonExistentItem(bundle));
  provider_->vessel()._defaultApplicationContainerForBundleIdentifier(
      bundle, [&](LocalVessel::ItemResult answer) { item = std::move(answer); });
  if (item) return ApplicationContainer{recordOf(**item), lookup_.isLibrary((*item)->fileURL())};
  if (!item.error().is(VesselErrorCode::invalidParameter)) return fail(item.error());
  Error error = Error::local(LocalVesselError::itemNotFound);
  error.userInfo[std::string(errorkey::detail)] = whyNoContainer(bundle);
  return fail(std::move(error));
}

Result<std::optional<Data>> LocalDocuments::icon(const std::string& identifier,
                                                 std::uint32_t side) {
  Result<std::optional<Data>> picture;
  const auto points = static_cast<double>(side);
  provider_->vessel().fetchThumbnailsForItemIdentifiers(
      {identifier}, {points, points},
      AppThumbnails::PerThumbnailHandler(
          [&](std::string_view, std::optional<Data> image, std::optional<Error> error) {
            if (error) {
              picture = fail(*std::move(error));
            } else {
              picture = std::move(image);
            }
          }),
      [](const auto&) {});
  return picture;
}

// What has gone since it was found is left out.
std::vector<ItemRecord> LocalDocuments::found(const std::vector<std::string>& identifiers) {
  std::vector<ItemRecord> items;
  items.reserve(identifiers.size());
  for (const std::string& identifier : identifiers)
    if (auto record = item(identifier)) items.push_back(*std::move(record));
  return items;
}

Result<std::vector<ItemRecord>> LocalDocuments::search(const SearchQuery& query) {
  const auto identifiers = searching_.search(query);
  if (!identifiers) return fail(identifiers.error());
  return found(*identifiers);
}

Result<std::vector<ItemRecord>> LocalDocuments::recent(std::size_t limit) {
  const auto identifiers = searching_.recent(limit);
  if (!identifiers) return fail(identifiers.error());
  return found(*identifiers);
}

Result<std::vector<ItemRecord>> LocalDocuments::favorites(std::size_t limit) {
  const auto identifiers = searching_.favorites(limit);
  if (!identifiers) return fail(identifiers.error());
  return found(*identifiers);
}

Result<StatusReport> LocalDocuments::status() {
  return statusOf(*provider_);
}

HomePlaces LocalDocuments::places() {
  return {provider_->linuxPlatform().home(), provider_->linuxPlatform().stateFolder()};
}

}  // namespace mirabel
