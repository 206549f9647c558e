#include <algorithm>
#include <chrono>
#include <filesystem>
#include <gtest/gtest.h>
#include <semaphore>

#include "cli/InstalledApps.h"
#include "host/ContainerWatches.h"
#include "host/LocalContainer.h"
#include "mirabel/Containers.h"

namespace mirabel::testing {
namespace {

using namespace std::chrono_literals;

class ContainerWatchesTest : public ::testing::TestWithParam<std::string_view> {
 protected:
  /// Wakes by signals alone: no look comes in time.
  void watch() {
    const std::string identifier(GetParam());
    container = std::move(LocalContainer::open(*provider, identifier).value());
    watches = std::make_unique<ContainerWatches>(*provider, 1h);
    watched = watches->add(identifier, [this] { woken.release(); }).value();
    anchor = container->currentSyncAnchor().value();
  }
  /// Whether something of that name is told, once the watch wakes for it, or that it is gone.
  bool isWokenFor(std::string_view name) {
    while (woken.try_acquire_for(30s)) {
      for (bool more = true; more;) {
        auto changes = container->changes(anchor).value();
        anchor = std::move(changes.anchor);
        more = changes.moreComing;
        for (const ItemRecord& item : changes.updated)
          if (item.filename == name) return true;
        if (std::ranges::count(changes.deleted, name) > 0) return true;
      }
    }
    return false;
  }

  const TempHome home;
  const InstalledApps apps{home};
  std::unique_ptr<HostedProvider> provider = [this] {
    return HostedProvider::open({.home = home.path()}).value();
  }();
  std::counting_semaphore<> woken{0};
  std::unique_ptr<DocumentContainer> container;
  std::unique_ptr<ContainerWatches> watches;
  std::unique_ptr<ContainerWatch> watched;
  Data anchor;
};

TEST_P(ContainerWatchesTest, AreWokenForApplicationsThatComeAndGoAndForWhatHappensInThem) {
  const std::string bundle = "org.example.Draw";
  std::filesystem::create_directories(apps.documents(bundle) + "/old");
  watch();
  provider->watchApplications();
  apps.install(bundle, "Draw");
  const bool isOfFolders = GetParam() == VesselAllDirectoriesContainerItemIdentifier;
  ASSERT_TRUE(isWokenFor(isOfFolders ? "old" : "Draw"));
  // The folder was not there when the watch began.
  const bool isRoot = GetParam() == VesselRootContainerItemIdentifier;
  std::filesystem::create_directory((isRoot ? home.documents() : apps.documents(bundle)) + "/new");
  EXPECT_TRUE(isWokenFor("new"));
  const std::string gone =
      isOfFolders
          ? provider->vessel()
                .persistentIdentifierForItemAtURL(URL::fileURL(apps.documents(bundle) + "/new"))
                .value()
          : "#" + bundle;
  apps.remove(bundle);
  EXPECT_TRUE(isWokenFor(gone));
}

INSTANTIATE_TEST_SUITE_P(Each, ContainerWatchesTest,
                         ::testing::Values(VesselRootContainerItemIdentifier,
                                           VesselWorkingSetContainerItemIdentifier,
                                           VesselAllDirectoriesContainerItemIdentifier));

}  // namespace
}  // namespace mirabel::testing
