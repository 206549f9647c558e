#include "linux/files/LinuxPlatform.h"

#include "linux/apps/ApplicationMonitor.h"
#include "linux/apps/LinuxApplicationRegistry.h"
#include "linux/apps/LocalNotificationCenter.h"
#include "linux/events/LinuxEventStreams.h"
#include "linux/files/HomeLayout.h"
#include "linux/files/LinuxCacheFiles.h"
#include "linux/files/LinuxDirectorySizer.h"
#include "linux/files/LinuxDirectoryStreams.h"
#include "linux/files/LinuxExtendedAttributes.h"
#include "linux/files/LinuxFileObjects.h"
#include "linux/files/LinuxGenerationalStore.h"
#include "linux/files/LinuxResourceValues.h"
#include "linux/files/LinuxVesselManager.h"
#include "linux/files/LinuxVolumeHistory.h"
#include "linux/files/PackageTypes.h"
#include "linux/files/SystemClock.h"
#include "linux/icons/LinuxIconService.h"
#include "linux/operations/LinuxFileOperations.h"
#include "linux/volume/StoredListingPositions.h"

namespace mirabel {

namespace {

ApplicationPlaces placesOf(const LinuxApplicationRegistry::Options& registry) {
  ApplicationPlaces places{registry.directories.user, registry.home + "/.var/app"};
  const auto& ofSystem = registry.directories.system;
  places.directories.insert(places.directories.end(), ofSystem.begin(), ofSystem.end());
  return places;
}

}  // namespace

// In the order in which they need each other.
struct LinuxPlatform::Parts {
  Parts(HomeLayout where, std::unique_ptr<MonitoredRoots> folders,
        std::unique_ptr<VolumeIndex> volumeIndex, LinuxApplicationRegistry::Options registry,
        LinuxIconService::Options iconOptions, FileCalls::Check check)
      : layout(std::move(where)),
        roots(std::move(folders)),
        index(std::move(volumeIndex)),
        operations(*roots, *index, attributes, {PackageTypes::isPackageName, std::move(check)}),
        places(placesOf(registry)),
        applications(std::move(registry)),
        icons(std::move(iconOptions)) {}

  HomeLayout layout;
  std::unique_ptr<MonitoredRoots> roots;
  std::unique_ptr<VolumeIndex> index;
  TypeTable types;
  LookContext context{*roots, *index, types};
  LinuxResourceValues resources{context};
  LinuxExtendedAttributes attributes{context};
  LinuxFileObjects objects{context};
  LinuxGenerationalStore documents{context};
  LinuxDirectoryStreams directories{*roots};
  LinuxDirectorySizer sizes{*roots};
  LinuxFileOperations operations;
  LocalNotificationCenter notifications;
  ApplicationPlaces places;
  LinuxApplicationRegistry applications;
  LinuxIconService icons;
  LinuxVesselManager manager{URL::fileURL(layout.documents)};
  LinuxVolumeHistory history{*index};
  LinuxEventStreams events{*index};
  SystemClock clock;
  StoredListingPositions positions{index->stateFolder()};
  LinuxCacheFiles caches{URL::fileURL(layout.applicationSupport), layout.stateFolder};
  Platform platform{resources,    attributes, objects, documents, directories, sizes, operations,
                    applications, manager,    history, clock,     positions,   caches};
  std::unique_ptr<ApplicationMonitor> applicationMonitor;  // where it is wanted
};

Result<std::unique_ptr<LinuxPlatform>> LinuxPlatform::open(Options options) {
  auto layout = HomeLayout::resolve({options.home, options.documents, options.stateFolder});
  if (!layout) return fail(layout.error());
  auto roots = std::make_unique<MonitoredRoots>(std::vector{layout->documents});
  if (const auto known = roots->volume(); !known) {
    return fail(
        Error::posix(static_cast<int>(known.error().code),
                     "the document storage \"" + layout->documents + "\" cannot be looked at"));
  }
  VolumeIndex::Options indexOptions;
  // A document storage that is missing belongs where it would be made.
  indexOptions.volumePath = roots->isThere(layout->documents) ? layout->documents : layout->home;
  indexOptions.stateFolder = layout->stateFolder;
  indexOptions.isPackageName = PackageTypes::isPackageName;
  indexOptions.makeWatcher = std::move(options.makeWatcher);
  indexOptions.timeout = options.timeout;
  indexOptions.notice = std::move(options.notice);
  indexOptions.broken = std::move(options.broken);
  LinuxApplicationRegistry::Options registry;
  registry.home = layout->home;
  registry.directories = ApplicationDirectories::of(
      layout->home, options.home ? ApplicationDirectories::Reach::homeAlone
                                 : ApplicationDirectories::Reach::wholeMachine);
  const auto reach =
      options.home ? IconFolders::Reach::homeAlone : IconFolders::Reach::wholeMachine;
  LinuxIconService::Options icons{IconFolders::of(layout->home, reach),
                                  chosenIconTheme(layout->home, reach)};
  const auto volume = statusOf(indexOptions.volumePath);
  if (!volume) return fail(volume.error());
  registry.device = volume->device;
  auto index = VolumeIndex::open(*roots, std::move(indexOptions));
  if (!index) return fail(index.error());
  return std::unique_ptr<LinuxPlatform>(new LinuxPlatform(std::make_unique<Parts>(
      std::move(*layout), std::move(roots), std::move(*index), std::move(registry),
      std::move(icons), std::move(options.checkFileCall))));
}

LinuxPlatform::LinuxPlatform(std::unique_ptr<Parts> parts) : parts_(std::move(parts)) {}

LinuxPlatform::~LinuxPlatform() = default;

EventStreams& LinuxPlatform::events() const {
  return parts_->events;
}

LinuxApplicationRegistry& LinuxPlatform::applications() const {
  return parts_->applications;
}

IconService& LinuxPlatform::icons() const {
  return parts_->icons;
}

void LinuxPlatform::watchApplications() {
  if (parts_->applicationMonitor) return;
  parts_->applicationMonitor = std::make_unique<ApplicationMonitor>(
      ApplicationMonitor::Options{parts_->places}, parts_->notifications);
  parts_->notifications.post(notification::applicationRegistered);
}

NotificationCenter& LinuxPlatform::notifications() const {
  return parts_->notifications;
}

const OperationProgress& LinuxPlatform::progress() const {
  return parts_->operations.progress();
}

const Platform& LinuxPlatform::platform() const {
  return parts_->platform;
}

LinuxVesselManager& LinuxPlatform::manager() const {
  return parts_->manager;
}

VolumeIndex& LinuxPlatform::index() const {
  return *parts_->index;
}

const std::string& LinuxPlatform::home() const {
  return parts_->layout.home;
}

const std::string& LinuxPlatform::stateFolder() const {
  return parts_->layout.stateFolder;
}

}  // namespace mirabel
