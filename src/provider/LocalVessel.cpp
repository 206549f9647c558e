#include "provider/LocalVessel.h"

#include <cerrno>
#include <string>
#include <utility>

#include "enumeration/LocalFileEnumerator.h"
#include "enumeration/LocalRootEnumerator.h"
#include "foundation/Log.h"
#include "identity/MRBFileObjectIdentifier.h"
#include "items/LocalAppLibraryItem.h"

namespace mirabel {
namespace {

constexpr std::string_view temporaryLocalFolderName = ".TemporaryLocalFolder";

/// The caller may have kept its URL for long, and with it what was cached of the file.
URL uncached(const URL& url) {
  return url.isFileURL() ? URL::fileURL(url.path()) : url;
}

/// Hard links are made of documents only.
bool mayHaveSeveralNames(std::string_view identifier) {
  return identifier.starts_with("did=");
}

}  // namespace

LocalVessel::LocalVessel(const Platform& platform, const AppLibraryRoots& roots,
                         const AppLibraryOwners& owners, std::optional<ChangeServices> changes,
                         std::optional<ApplicationServices> applications)
    : platform_(platform),
      roots_(roots),
      identity_(platform_, roots),
      context_{platform_, identity_, owners},
      changes_(std::move(changes)),
      applications_(std::move(applications)) {
  if (!applications_) return;
  thumbnails_.emplace(platform_.applications, applications_->icons);
  startUp();
}

LocalVessel::~LocalVessel() {
  shutDown();
  liveUpdates_.stop();
  underway_.wait();
}

std::optional<URL> LocalVessel::URLForItemWithPersistentIdentifier(
    std::string_view identifier) const {
  return _urlForItemWithPersistentIdentifier(identifier);
}

std::optional<URL> LocalVessel::_urlForItemWithPersistentIdentifier(
    std::string_view identifier, const std::optional<URL>& place) const {
  const Result<URL> url = urlForIdentifier(identifier, place);
  if (url) return *url;
  // 2 says "not found" in the domains that may arrive here, which is nothing unusual.
  logMessage(url.error().code == 2 ? LogLevel::debug : LogLevel::error,
             "can't find URL matching identifier " + std::string(identifier) + "; " +
                 url.error().description());
  return {};
}

Result<URL> LocalVessel::urlForIdentifier(std::string_view identifier,
                                          const std::optional<URL>& place) const {
  const LogSection section("fetching URL for " + quoted(identifier));
  const auto item = lookUpItem(identifier, place);
  if (!item) return fail(Error::nonExistentItem(identifier));
  logDebug([&] { return "found " + item->url().description(); });
  return item->url();
}

std::optional<std::string> LocalVessel::persistentIdentifierForItemAtURL(const URL& url) const {
  return _persistentIdentifierForItemAt(url);
}

std::optional<std::string> LocalVessel::_persistentIdentifierForItemAt(const URL& url) const {
  const LogSection section("fetching item identifier for " + quoted(url.path()));
  auto identifier = identifierForURL(url);
  if (identifier) logDebug([&] { return "found " + *identifier; });
  return identifier;
}

std::optional<std::string> LocalVessel::identifierForURL(const URL& url) const {
  if (url.lastPathComponent() == "Documents") {
    auto identifier =
        MRBFileObjectIdentifier::fromAppLibraryDataContainerURL(platform_.applications, url);
    if (identifier) return identifier;
  }
  const auto item = LocalItem::create(context_, uncached(url));
  if (!item) return {};
  return item->itemIdentifier();
}

LocalVessel::ItemResult LocalVessel::itemForIdentifier(std::string_view identifier) const {
  const LogSection section("fetching item's properties for " + quoted(identifier));
  auto item = lookUpItem(identifier);
  if (!item) {
    logError("item lookup failed for identifier " + quoted(identifier));
    return fail(Error::local(LocalVesselError::invalidItemIdentifier));
  }
  logDebug([&] { return "found " + item->description(); });
  return item;
}

LocalVessel::ItemResult LocalVessel::_propertiesForItemAtURL(const URL& url) const {
  const auto identifier = _persistentIdentifierForItemAt(url);
  if (!identifier) {
    logError("identifier lookup failed for URL " + quoted(url.path()));
    return fail(Error::local(LocalVesselError::invalidItemIdentifier));
  }
  if (identifier->starts_with('#') || *identifier == VesselTemporaryLocalFolderItemIdentifier) {
    return itemForIdentifier(*identifier);
  }
  auto item = LocalItem::create(context_, uncached(url));
  if (!item) {
    logError("can't create item for URL " + quoted(url.path()));
    return fail(Error::local(LocalVesselError::invalidItemIdentifier));
  }
  return item;
}

Result<std::shared_ptr<VesselEnumerator>> LocalVessel::enumeratorForContainerItemIdentifier(
    std::string_view identifier, LiveUpdates liveUpdates) {
  const LogSection section("enumerator for " + std::string(identifier));
  if (!changes_) return fail(Error::posix(ENOTSUP, "this provider follows no changes"));
  const EnumerationServices services{context_, *changes_, walks_};
  if (eventScopeOf(identifier) == FSEventScope::everything) {
    if (!applications_) return fail(Error::posix(ENOTSUP, "this provider follows no applications"));
    return LocalRootEnumerator::create(services, applications_->libraries, std::string(identifier),
                                       liveUpdates, liveUpdates_);
  }
  auto url = urlForIdentifier(identifier);
  if (!url) return fail(url.error());
  auto enumerator = LocalFileEnumerator::create(services, std::string(identifier),
                                                {*std::move(url)}, liveUpdates);
  if (const auto& notifier = enumerator->notifier()) liveUpdates_.add(notifier->reader());
  enumerator->startNotifier();
  return enumerator;
}

void LocalVessel::providePlaceholderAtURL(const URL& url,
                                          const ErrorHandler& completionHandler) const {
  startProvidingItemAtURL(url, completionHandler);
}

void LocalVessel::startProvidingItemAtURL(const URL&, const ErrorHandler& completionHandler) const {
  completionHandler(std::nullopt);
}

void LocalVessel::stopProvidingItemAtURL(const URL&) const {}

void LocalVessel::itemChangedAtURL(const URL&) const {}

std::shared_ptr<LocalItem> LocalVessel::lookUpItem(std::string_view identifier,
                                                   const std::optional<URL>& place) const {
  if (place && mayHaveSeveralNames(identifier)) {
    auto item = LocalItem::create(context_, uncached(*place));
    return item && item->itemIdentifier() == identifier ? item : nullptr;
  }
  if (identifier.starts_with('#')) {
    const auto proxy = platform_.applications.proxyForBundleIdentifier(identifier.substr(1));
    return proxy ? LocalAppLibraryItem::create(context_, *proxy) : nullptr;
  }
  if (identifier == VesselTemporaryLocalFolderItemIdentifier) return temporaryLocalFolder();
  const auto url = identity_.fileURLWithItemIdentifier(identifier);
  return url ? LocalItem::create(context_, *url) : nullptr;
}

std::shared_ptr<LocalItem> LocalVessel::temporaryLocalFolder() const {
  const URL folder =
      platform_.manager.documentStorageURL().appendingPathComponent(temporaryLocalFolderName);
  if (auto created = platform_.operations.createDirectory(folder); !created) {
    logError("can't create temporary directory; " + created.error().description());
    return nullptr;
  }
  return LocalItem::create(context_, folder);
}

}  // namespace mirabel
