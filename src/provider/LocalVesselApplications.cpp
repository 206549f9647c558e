// How the provider keeps up with the installed applications.
#include <chrono>
#include <mutex>
#include <string>
#include <utility>

#include "foundation/Log.h"
#include "provider/LocalVessel.h"

namespace mirabel {
namespace {

constexpr std::chrono::milliseconds minimumFireInterval{500};
// After a failure that nothing signals the end of: too many open files, no room.
constexpr std::chrono::seconds beforeNextTry{10};

void signal(VesselManager& manager, std::string_view container) {
  manager.signalEnumeratorForContainerItemIdentifier(container, [](const std::optional<Error>&) {});
}

}  // namespace

struct LocalVessel::InstalledAppsProxy {
  std::mutex mutex;
  LocalVessel* provider = nullptr;  // null from when it goes

  void applicationsChanged() {
    const std::lock_guard lock(mutex);
    if (provider != nullptr) provider->appRefreshPacer_->signal();
  }
};

void LocalVessel::startUp() {
  installedAppsProxy_ = std::make_shared<InstalledAppsProxy>();
  appRefreshPacer_ = std::make_unique<VSPacer>("mirabel.app-refresh.pacer", appRefreshQueue_,
                                               minimumFireInterval, applications_->clock);
  appRefreshPacer_->setEventBlock([this] { refreshAppLibraries(); });
  appRefreshPacer_->resume();
  appRefreshPacer_->signal();
  installedAppsProxy_->provider = this;
  for (const std::string_view name :
       {notification::applicationRegistered, notification::applicationUnregistered}) {
    applications_->notifications.addObserver(
        installedAppsProxy_.get(), name,
        [proxy = std::weak_ptr(installedAppsProxy_)](std::string_view) {
          if (const auto observer = proxy.lock()) observer->applicationsChanged();
        });
  }
  logInfo("auto notify changes on VesselWorkingSetContainerItemIdentifier at startup");
  signal(platform_.manager, VesselWorkingSetContainerItemIdentifier);
}

void LocalVessel::shutDown() {
  if (!installedAppsProxy_) return;
  {
    const std::lock_guard lock(installedAppsProxy_->mutex);
    installedAppsProxy_->provider = nullptr;
  }
  applications_->notifications.removeEveryObserver(installedAppsProxy_.get());
  appRefreshPacer_.reset();
}

void LocalVessel::refreshAppLibraries() {
  const LogSection section("pacer event");
  MRBAppLibraryManager& libraries = applications_->libraries;
  const bool hasMainCacheChanged = libraries.refreshFromRegistry();
  logDebug("auto-upgrading shared app library manager");
  const bool hasManagerChanged = libraries.upgradeFromMainCache();
  // Before anybody is told to ask: what lies in the libraries is to be told then.
  if (changes_) libraries.followLibraries(changes_->events);
  if (!libraries.isInStep()) appRefreshPacer_->signalAfter(beforeNextTry);
  if (hasMainCacheChanged) {
    logInfo("notify changes on VesselRootContainerItemIdentifier");
    signal(platform_.manager, VesselRootContainerItemIdentifier);
  }
  if (hasManagerChanged) {
    logInfo("notify changes on VesselWorkingSetContainerItemIdentifier");
    signal(platform_.manager, VesselWorkingSetContainerItemIdentifier);
  }
}

void LocalVessel::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
    const AppThumbnails::PerThumbnailHandler& perThumbnailCompletionHandler,
    const AppThumbnails::CompletionHandler& completionHandler) const {
  const auto forward = [&](std::string_view identifier, std::optional<Data> image,
                           const std::optional<std::string>&, std::optional<Error> error) {
    perThumbnailCompletionHandler(identifier, std::move(image), std::move(error));
  };
  fetchThumbnailsForItemIdentifiers(identifiers, requestedSize,
                                    AppThumbnails::PerTypedThumbnailHandler(forward),
                                    completionHandler);
}

void LocalVessel::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
    const AppThumbnails::PerTypedThumbnailHandler& perThumbnailCompletionHandlerWithType,
    const AppThumbnails::CompletionHandler& completionHandler) const {
  if (thumbnails_) {
    return thumbnails_->fetchThumbnailsForItemIdentifiers(
        identifiers, requestedSize, perThumbnailCompletionHandlerWithType, completionHandler);
  }
  for (const std::string& identifier : identifiers)
    perThumbnailCompletionHandlerWithType(identifier, {}, {}, {});
  completionHandler({});
}

void LocalVessel::waitForAppLibraries() {
  if (appRefreshPacer_) appRefreshPacer_->waitUntilIdle();
}

}  // namespace mirabel
