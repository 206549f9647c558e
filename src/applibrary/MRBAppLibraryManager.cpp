#include "applibrary/MRBAppLibraryManager.h"

#include <utility>
#include <vector>

#include "applibrary/AppLibraryRefresh.h"
#include "foundation/Log.h"

namespace mirabel {

MRBAppLibraryManager::MRBAppLibraryManager(const Platform& platform)
    : platform_(platform),
      caches_(platform.caches),
      shared_(platform, caches_, LocalAppLibraryCacheSource::workingSet) {}

bool MRBAppLibraryManager::refreshFromRegistry() {
  return inBackground([&] {
    std::optional<std::vector<BundleProxy>> latest;
    const auto refreshed = refreshMainCache(platform_.applications, caches_.main, &latest);
    note(refreshFailure_, refreshed ? std::nullopt : std::optional(refreshed.error()));
    if (!latest) return false;
    hasLibraries_ = !latest->empty();
    latestNames_.clear();
    for (BundleProxy& record : *latest) {
      if (!record.dataContainerURL || !record.localizedName) continue;
      latestNames_.emplace(record.dataContainerURL->path(), *std::move(record.localizedName));
    }
    return refreshed.value_or(false);
  });
}

void MRBAppLibraryManager::followLibraries(EventStreams& events) {
  backgroundQueue_.sync([&] {
    // There are libraries and their list can't be kept: no reason to let go of those of before.
    if (shared_.versionToken() == 0 && hasLibraries_) return;
    std::vector<FollowedLibrary> libraries;
    for (auto& [folder, record] : shared_.foldersAndRecords()) {
      const auto latest = latestNames_.find(record.dataContainerURL->path());
      libraries.push_back({folder, latest != latestNames_.end()
                                       ? latest->second
                                       : std::move(record.localizedName).value_or("")});
    }
    auto done = events.followLibraries(libraries, shared_.versionToken());
    note(followFailure_, done ? std::nullopt : std::optional(done.error()));
    if (!done) logError("can't follow the app libraries; " + done.error().description());
  });
}

bool MRBAppLibraryManager::upgradeFromMainCache(VesselChangeObserver* observer) {
  return inBackground([&] { return shared_.upgradeFromMainCache(observer); });
}

std::optional<Error> MRBAppLibraryManager::failure() const {
  const std::lock_guard lock(mutex_);
  return refreshFailure_ ? refreshFailure_ : followFailure_;
}

void MRBAppLibraryManager::note(std::optional<Error>& failure,
                                const std::optional<Error>& outcome) {
  const std::lock_guard lock(mutex_);
  failure = outcome;
}

bool MRBAppLibraryManager::inBackground(const std::function<bool()>& work) {
  bool outcome = false;
  backgroundQueue_.sync([&] { outcome = work(); });
  return outcome;
}

}  // namespace mirabel
