#include "applibrary/LocalAppLibraryManager.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "applibrary/SearchIndexCleanup.h"
#include "foundation/Log.h"
#include "identity/MRBFileObjectIdentifier.h"

namespace mirabel {

LocalAppLibraryManager::LocalAppLibraryManager(const Platform& platform, AppLibraryCaches& caches,
                                               LocalAppLibraryCacheSource source)
    : platform_(platform), caches_(caches), cacheSource_(source), identity_(platform, *this) {
  const AppLibraryContent none(0, platform_.manager.documentStorageURL());
  current_ =
      built(caches_.of(source).load().value_or(LocalAppLibraryCache::Content()), none, Reuse::none);
}

bool LocalAppLibraryManager::upgradeFromMainCache(VesselChangeObserver* observer) {
  const LogSection section("upgrading content from main cache");
  const Version former = current();
  const std::uint64_t mainToken = caches_.main.versionToken();
  if (mainToken == former->versionToken() && former->isComplete()) return false;
  if (former->versionToken() > mainToken) {
    logError("version token shouldn't be greater than the main's cache version (" +
             std::to_string(former->versionToken()) + " vs " + std::to_string(mainToken) + "); " +
             description());
  }
  auto content = caches_.main.load();
  // The file may have moved on since the token was read: the token that came with the records is
  // the one that stands for them.
  if (!content) content = LocalAppLibraryCache::Content{{}, mainToken};
  const Version next =
      built(*std::move(content), *former, observer == nullptr ? Reuse::sameRecords : Reuse::none);
  report(*former, *next, observer);
  install(next);
  logDebug([&] { return "upgraded manager " + description(); });
  return next->versionToken() != former->versionToken() || *next->rootURLs() != *former->rootURLs();
}

LocalAppLibraryManager::Version LocalAppLibraryManager::built(LocalAppLibraryCache::Content content,
                                                              const AppLibraryContent& former,
                                                              Reuse reuse) const {
  auto next = std::make_shared<AppLibraryContent>(content.versionToken,
                                                  platform_.manager.documentStorageURL());
  learnFolders(content.records, former);
  for (const BundleProxy& record : content.records) {
    // Without a container there is nothing to be in anybody's way, and the item says why it fails.
    const bool mayTry = !record.dataContainerURL || next->hasRoomFor(record);
    auto item = mayTry ? itemOf(record, former, reuse) : nullptr;
    if (!item) {
      logDebug([&] { return "can't create app library for " + record.description(); });
      if (mayTry && record.dataContainerURL) next->addUnmade();
      continue;
    }
    next->add({record, std::move(item)});
  }
  next->finish(std::move(content.records));
  return next;
}

/// Has the new ones looked at in one go: one by one, each would be a durable write.
void LocalAppLibraryManager::learnFolders(const std::vector<BundleProxy>& records,
                                          const AppLibraryContent& former) const {
  std::vector<URL> folders;
  for (const BundleProxy& record : records) {
    if (!record.dataContainerURL) continue;
    URL folder = documentFolderOf(*record.dataContainerURL);
    if (former.atRootURL(folder) == nullptr) folders.push_back(std::move(folder));
  }
  if (folders.empty()) return;
  // Where that fails, each is looked at when it is made an item.
  if (auto fetched = platform_.resources.prefetch(folders); !fetched) {
    logDebug([&] { return "can't look at the app libraries; " + fetched.error().description(); });
  }
}

std::shared_ptr<LocalAppLibraryItem> LocalAppLibraryManager::itemOf(const BundleProxy& record,
                                                                    const AppLibraryContent& former,
                                                                    Reuse reuse) const {
  const auto* library = record.dataContainerURL
                            ? former.atRootURL(documentFolderOf(*record.dataContainerURL))
                            : nullptr;
  const bool isSame = library != nullptr && makeTheSame(library->record, record);
  if (reuse == Reuse::sameRecords) return isSame ? library->item : made(record);
  return itemOfNow(record, isSame ? library->item : nullptr);
}

/// The comparison of the lists does not see that a display name changed, so the record may have
/// an old one.
std::shared_ptr<LocalAppLibraryItem> LocalAppLibraryManager::itemOfNow(
    const BundleProxy& record, const std::shared_ptr<LocalAppLibraryItem>& former) const {
  BundleProxy latest = record;
  if (record.bundleIdentifier) {
    const auto known = platform_.applications.proxyForBundleIdentifier(*record.bundleIdentifier);
    if (known && known->dataContainerURL == record.dataContainerURL) {
      latest.localizedName = known->localizedName;
    }
  }
  if (auto item = made(latest)) return item;
  // Too many open files are no reason to tell a host that everything in the library is gone.
  return former && !isGone(former->fileURL()) ? former : nullptr;
}

std::shared_ptr<LocalAppLibraryItem> LocalAppLibraryManager::made(const BundleProxy& record) const {
  auto item = LocalAppLibraryItem::create({platform_, identity_, *this}, record);
  // An app library says of itself that it is a container; a file or a link under that name is none.
  return item && item->LocalItem::vs_isContainer() ? item : nullptr;
}

bool LocalAppLibraryManager::isGone(const URL& folder) const {
  const auto values = platform_.resources.readValues(folder);
  if (values) return values->kind != FileKind::folder;
  const Error& error = values.error();
  return error.is(FileErrorCode::noSuchFile) || error.isPosix(ENOTDIR) || error.isPosix(ELOOP);
}

void LocalAppLibraryManager::report(const AppLibraryContent& former, const AppLibraryContent& next,
                                    VesselChangeObserver* observer) const {
  if (observer != nullptr && !next.libraries().empty()) {
    VesselItems items;
    items.reserve(next.libraries().size());
    for (const AppLibraryContent::Library& library : next.libraries())
      items.push_back(library.item);
    observer->didUpdateItems(items);
  }
  // By the records: a library whose folder had gone when this began was never made an item here,
  // and is held all the same by whoever was told of it before.
  std::vector<std::string> deleted;
  for (const BundleProxy& record : former.records()) {
    std::string identifier = MRBFileObjectIdentifier::fromBundleProxy(record);
    if (next.withItemIdentifier(identifier) != nullptr || isUnmade(record, next)) continue;
    deleted.push_back(std::move(identifier));
  }
  std::ranges::sort(deleted);
  const auto repeated = std::ranges::unique(deleted);
  deleted.erase(repeated.begin(), repeated.end());
  if (deleted.empty()) return;
  if (observer != nullptr) observer->didDeleteItemsWithIdentifiers(deleted);
  deleteIndexOfDeletedAppLibraries(platform_.manager, deleted);
}

/// Whether the library is still in the list, and its folder there, though it can't be made an item
/// for now.
bool LocalAppLibraryManager::isUnmade(const BundleProxy& record,
                                      const AppLibraryContent& next) const {
  if (next.isComplete() || !record.dataContainerURL) return false;
  const bool isListed = std::ranges::find(next.records(), record.dataContainerURL,
                                          &BundleProxy::dataContainerURL) != next.records().end();
  return isListed && !isGone(documentFolderOf(*record.dataContainerURL));
}

LocalAppLibraryManager::Version LocalAppLibraryManager::current() const {
  const std::lock_guard lock(mutex_);
  return current_;
}

void LocalAppLibraryManager::install(Version version) {
  queue_.sync([&] {
    const std::lock_guard lock(mutex_);
    current_.swap(version);
  });
}

std::uint64_t LocalAppLibraryManager::versionToken() const {
  return current()->versionToken();
}

LocalAppLibraryCache::Content LocalAppLibraryManager::content() const {
  const Version version = current();
  return {version->records(), version->versionToken()};
}

std::vector<std::shared_ptr<LocalItem>> LocalAppLibraryManager::appLibraries() const {
  const Version version = current();
  std::vector<std::shared_ptr<LocalItem>> items;
  items.reserve(version->libraries().size());
  for (const AppLibraryContent::Library& library : version->libraries())
    if (auto item = itemOfNow(library.record, library.item)) items.push_back(std::move(item));
  return items;
}

std::shared_ptr<LocalAppLibraryItem> LocalAppLibraryManager::appLibraryWithItemIdentifier(
    std::string_view identifier) const {
  const Version version = current();
  const auto* library = version->withItemIdentifier(identifier);
  return library == nullptr ? nullptr : itemOfNow(library->record, library->item);
}

std::vector<std::pair<URL, BundleProxy>> LocalAppLibraryManager::foldersAndRecords() const {
  const Version version = current();
  std::vector<std::pair<URL, BundleProxy>> folders;
  folders.reserve(version->libraries().size());
  for (const AppLibraryContent::Library& library : version->libraries())
    folders.emplace_back(URL::fileURL(library.item->fileURL().path()), library.record);
  return folders;
}

std::optional<BundleProxy> LocalAppLibraryManager::bundleProxyWithRootURL(const URL& url) const {
  const Version version = current();
  const auto* library = version->atRootURL(url);
  return library == nullptr ? std::nullopt : std::optional(library->record);
}

AppLibraryRoots::List LocalAppLibraryManager::rootURLsForAppLibraries() const {
  return current()->rootURLs();
}

std::vector<URL> LocalAppLibraryManager::folders() const {
  std::vector<URL> folders;
  for (auto& [folder, record] : foldersAndRecords())
    folders.push_back(std::move(folder));
  return folders;
}

std::optional<BundleProxy> LocalAppLibraryManager::applicationOwning(const URL& url) const {
  const Version version = current();
  const auto* library = version->owning(url);
  return library == nullptr ? std::nullopt : std::optional(library->record);
}

std::string LocalAppLibraryManager::description() const {
  const Version version = current();
  return "<LocalAppLibraryManager cacheSource: " + std::string(rawValue(cacheSource_)) +
         ", versionToken: " + std::to_string(version->versionToken()) +
         ", appLibraries: " + std::to_string(version->libraries().size()) + ">";
}

}  // namespace mirabel
