#include "applibrary/MRBAppLibraryManager.h"

#include "applibrary/AppLibraryRefresh.h"

namespace mirabel {

MRBAppLibraryManager::MRBAppLibraryManager(const Platform& platform)
    : platform_(platform),
      caches_(platform.caches),
      shared_(platform, caches_, LocalAppLibraryCacheSource::workingSet) {}

bool MRBAppLibraryManager::refreshFromRegistry() {
  return inBackground([&] { return refreshMainCache(platform_.applications, caches_.main); });
}

bool MRBAppLibraryManager::upgradeFromMainCache(VesselChangeObserver* observer) {
  return inBackground([&] { return shared_.upgradeFromMainCache(observer); });
}

bool MRBAppLibraryManager::inBackground(const std::function<bool()>& work) {
  bool outcome = false;
  backgroundQueue_.sync([&] { outcome = work(); });
  return outcome;
}

}  // namespace mirabel
