#include "host/bus/RestrictedDocuments.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "platform/VesselManager.h"

namespace mirabel::bus {
namespace {

Error notForSandboxes() {
  return Error::posix(EACCES, "a sandboxed application sees its own documents only");
}

bool isMadeOfSeveralFolders(std::string_view container) {
  return container == VesselRootContainerItemIdentifier ||
         container == VesselWorkingSetContainerItemIdentifier ||
         container == VesselAllDirectoriesContainerItemIdentifier;
}

constexpr std::size_t mostLookedThrough = 1000;

std::vector<ItemRecord> firstOf(std::vector<ItemRecord> items, std::size_t limit) {
  if (items.size() > limit) items.resize(limit);
  return items;
}

ItemRecord withoutPlace(ItemRecord item) {
  item.path.clear();
  item.putBackPath.reset();
  return item;
}

}  // namespace

/// A folder of the application.
class RestrictedContainer final : public DocumentContainer {
 public:
  RestrictedContainer(RestrictedDocuments documents, std::string identifier,
                      std::unique_ptr<DocumentContainer> container)
      : documents_(std::move(documents)),
        identifier_(std::move(identifier)),
        container_(std::move(container)) {}

  Result<ItemPage> items(const Data& page) override {
    // It may have been moved to where it is nobody's business of the application's.
    if (auto own = documents_.requireOwn(identifier_); !own) return fail(own.error());
    auto answer = container_->items(page);
    if (answer) answer->items = documents_.own(std::move(answer->items));
    return answer;
  }
  Result<ItemChanges> changes(const Data& anchor) override {
    if (auto own = documents_.requireOwn(identifier_); !own) return fail(own.error());
    auto answer = container_->changes(anchor);
    if (!answer) return answer;
    // What has left the application's folder is told with its new place: gone, for this client.
    std::vector<ItemRecord> updated;
    for (ItemRecord& item : answer->updated) {
      if (documents_.isOwn(item)) {
        updated.push_back(withoutPlace(std::move(item)));
      } else {
        answer->deleted.push_back(std::move(item.itemIdentifier));
      }
    }
    answer->updated = std::move(updated);
    return answer;
  }
  Result<Data> currentSyncAnchor() override {
    if (auto own = documents_.requireOwn(identifier_); !own) return fail(own.error());
    return container_->currentSyncAnchor();
  }

 private:
  RestrictedDocuments documents_;
  std::string identifier_;
  std::unique_ptr<DocumentContainer> container_;
};

bool RestrictedDocuments::isOwn(const ItemRecord& item) const {
  return !bundle_.empty() && item.appContainerBundleIdentifier == bundle_;
}

Result<void> RestrictedDocuments::requireOwn(std::string_view identifier) const {
  const auto item = all_.item(identifier);
  if (!item || !isOwn(*item)) return fail(Error::nonExistentItem(identifier));
  return {};
}

Documents::ItemResult RestrictedDocuments::shown(ItemResult item) const {
  if (!item) return item;
  return withoutPlace(*std::move(item));
}

std::vector<ItemRecord> RestrictedDocuments::own(std::vector<ItemRecord> items) const {
  std::erase_if(items, [this](const ItemRecord& item) { return !isOwn(item); });
  for (ItemRecord& item : items)
    item = withoutPlace(std::move(item));
  return items;
}

Documents::ItemHandler RestrictedDocuments::shown(ItemHandler handler) const {
  return [handler = std::move(handler)](ItemResult item) {
    handler(item ? ItemResult(withoutPlace(*std::move(item))) : std::move(item));
  };
}

Documents::ItemResult RestrictedDocuments::item(std::string_view identifier) {
  auto item = all_.item(identifier);
  if (!item || !isOwn(*item)) return fail(Error::nonExistentItem(identifier));
  return shown(std::move(item));
}

Documents::ItemResult RestrictedDocuments::itemAtPath(const std::string&) {
  return fail(notForSandboxes());
}

Result<std::unique_ptr<DocumentContainer>> RestrictedDocuments::container(
    std::string_view identifier) {
  if (isMadeOfSeveralFolders(identifier)) return fail(notForSandboxes());
  if (auto own = requireOwn(identifier); !own) return fail(own.error());
  auto container = all_.container(identifier);
  if (!container) return container;
  return std::make_unique<RestrictedContainer>(*this, std::string(identifier),
                                               *std::move(container));
}

Result<std::unique_ptr<ContainerWatch>> RestrictedDocuments::watch(std::string_view identifier,
                                                                   std::function<void()> changed) {
  if (isMadeOfSeveralFolders(identifier)) return fail(notForSandboxes());
  if (auto own = requireOwn(identifier); !own) return fail(own.error());
  // Of one that has left the application's folder it is told that, and nothing more.
  return all_.watch(identifier, [documents = *this, watched = std::string(identifier),
                                 wasOwn = true, changed = std::move(changed)]() mutable {
    const bool isOwn = documents.requireOwn(watched).has_value();
    if (std::exchange(wasOwn, isOwn) || isOwn) changed();
  });
}

Result<UniqueFd> RestrictedDocuments::openFile(std::string_view identifier, Access access) {
  if (auto own = requireOwn(identifier); !own) return fail(own.error());
  return all_.openFile(identifier, access);
}

void RestrictedDocuments::importDocument(const std::string& source, const std::string& parent,
                                         ItemHandler handler) {
  if (auto own = requireOwn(parent); !own) return handler(fail(own.error()));
  all_.importDocument(source, parent, shown(std::move(handler)));
}

void RestrictedDocuments::createDirectory(const std::string& name, const std::string& parent,
                                          ItemHandler handler) {
  if (auto own = requireOwn(parent); !own) return handler(fail(own.error()));
  all_.createDirectory(name, parent, shown(std::move(handler)));
}

// Paths are not for its callers: of theirs, only the identifier is handed on.

void RestrictedDocuments::rename(const ItemTarget& item, const std::string& name,
                                 ItemHandler handler) {
  if (auto own = requireOwn(item.itemIdentifier); !own) return handler(fail(own.error()));
  all_.rename(item.itemIdentifier, name, shown(std::move(handler)));
}

void RestrictedDocuments::reparent(const ItemTarget& item, const std::string& parent,
                                   const std::optional<std::string>& newName, ItemHandler handler) {
  if (auto own = requireOwn(parent); !own) return handler(fail(own.error()));
  if (auto own = requireOwn(item.itemIdentifier); !own) return handler(fail(own.error()));
  all_.reparent(item.itemIdentifier, parent, newName, shown(std::move(handler)));
}

void RestrictedDocuments::remove(const ItemTarget& item, ErrorHandler handler) {
  if (auto own = requireOwn(item.itemIdentifier); !own) return handler(own.error());
  all_.remove(item.itemIdentifier, std::move(handler));
}

void RestrictedDocuments::trash(const ItemTarget& item, ItemHandler handler) {
  if (auto own = requireOwn(item.itemIdentifier); !own) return handler(fail(own.error()));
  all_.trash(item.itemIdentifier, shown(std::move(handler)));
}

void RestrictedDocuments::restore(const ItemTarget& item, const std::optional<std::string>& parent,
                                  ItemHandler handler) {
  if (auto own = requireOwn(item.itemIdentifier); !own) return handler(fail(own.error()));
  if (parent) {
    if (auto own = requireOwn(*parent); !own) return handler(fail(own.error()));
  }
  all_.restore(item.itemIdentifier, parent, shown(std::move(handler)));
}

void RestrictedDocuments::setLastUsedDate(const std::string& identifier,
                                          const std::optional<Date>& date, ItemHandler handler) {
  if (auto own = requireOwn(identifier); !own) return handler(fail(own.error()));
  all_.setLastUsedDate(identifier, date, shown(std::move(handler)));
}

void RestrictedDocuments::setTagData(const std::string& identifier,
                                     const std::optional<Data>& tagData, ItemHandler handler) {
  if (auto own = requireOwn(identifier); !own) return handler(fail(own.error()));
  all_.setTagData(identifier, tagData, shown(std::move(handler)));
}

void RestrictedDocuments::setFavoriteRank(const std::string& identifier,
                                          const std::optional<Number>& rank, ItemHandler handler) {
  if (auto own = requireOwn(identifier); !own) return handler(fail(own.error()));
  all_.setFavoriteRank(identifier, rank, shown(std::move(handler)));
}

Result<TrashFindings> RestrictedDocuments::itemsTrashedBefore(const Date&) {
  return fail(notForSandboxes());
}

void RestrictedDocuments::removeItemsTrashedBefore(const Date&, ErrorHandler handler) {
  handler(notForSandboxes());
}

Result<std::vector<ItemRecord>> RestrictedDocuments::appLibraries() {
  auto libraries = all_.appLibraries();
  if (!libraries) return libraries;
  return own(*std::move(libraries));
}

Result<ApplicationContainer> RestrictedDocuments::applicationContainer(const std::string& bundle) {
  if (bundle_.empty() || bundle != bundle_) return fail(Error::nonExistentItem("#" + bundle));
  auto container = all_.applicationContainer(bundle);
  if (container) container->item = withoutPlace(std::move(container->item));
  return container;
}

Result<std::optional<Data>> RestrictedDocuments::icon(const std::string& identifier,
                                                      std::uint32_t side) {
  if (auto own = requireOwn(identifier); !own) return fail(own.error());
  return all_.icon(identifier, side);
}

Result<std::vector<ItemRecord>> RestrictedDocuments::search(const SearchQuery& query) {
  SearchQuery narrowed = query;
  narrowed.domain = bundle_;
  auto items = all_.search(narrowed);
  if (!items) return items;
  return own(*std::move(items));
}

// Its own among those of everybody: an application has few, and what is far back is not recent.
Result<std::vector<ItemRecord>> RestrictedDocuments::recent(std::size_t limit) {
  auto items = all_.recent(std::max(limit, mostLookedThrough));
  if (!items) return items;
  return firstOf(own(*std::move(items)), limit);
}

Result<std::vector<ItemRecord>> RestrictedDocuments::favorites(std::size_t limit) {
  auto items = all_.favorites(std::max(limit, mostLookedThrough));
  if (!items) return items;
  return firstOf(own(*std::move(items)), limit);
}

Result<StatusReport> RestrictedDocuments::status() {
  return fail(notForSandboxes());
}

}  // namespace mirabel::bus
