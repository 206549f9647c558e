#include <cerrno>

#include "enumeration/LocalFileEnumerator.h"
#include "enumeration/LocalRootEnumerator.h"
#include "provider/HostedFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;

class EnumeratorForContainerTest : public HostedFixture {
 protected:
  EnumeratorForContainerTest() {
    install("org.example.draw", "Draw");
    fake.volume.makeFolder(fake.path("folder"));
    start();
    log.clear();
  }
  std::vector<URL> urlsOf(std::string_view container) {
    const auto enumerator = vessel->enumeratorForContainerItemIdentifier(container);
    if (!enumerator) return {};
    if (const auto* several = dynamic_cast<LocalRootEnumerator*>(enumerator->get())) {
      EXPECT_EQ(several->container(), container);
      return several->localFileEnumerator()->urls();
    }
    const auto& files = dynamic_cast<LocalFileEnumerator&>(**enumerator);
    EXPECT_EQ(files.container(), container);
    return files.urls();
  }
  std::shared_ptr<VesselEnumerator> rootEnumerator() {
    return vessel->enumeratorForContainerItemIdentifier(VesselRootContainerItemIdentifier).value();
  }
  static SerialQueue notifierQueue(VesselEnumerator& enumerator) {
    const auto files = dynamic_cast<LocalRootEnumerator&>(enumerator).localFileEnumerator();
    return files->notifier()->reader()->streamQueue();
  }
};

TEST_F(EnumeratorForContainerTest, EachContainerHasItsFolders) {
  const URL library = URL::fileURL("/apps/org.example.draw/Documents");
  const std::string folder = "fid=" + std::to_string(fake.volume.at(fake.path("folder")).fileID);
  EXPECT_THAT(urlsOf(folder), ElementsAre(fake.url("folder")));
  EXPECT_THAT(log.sectionLabels(),
              ElementsAre("enumerator for " + folder, "fetching URL for \"" + folder + "\""));
  EXPECT_THAT(urlsOf("#org.example.draw"), ElementsAre(library));
  EXPECT_THAT(urlsOf(VesselTemporaryLocalFolderItemIdentifier),
              ElementsAre(fake.url(".TemporaryLocalFolder")));
  log.clear();
  for (const std::string_view container :
       {VesselRootContainerItemIdentifier, VesselWorkingSetContainerItemIdentifier,
        VesselAllDirectoriesContainerItemIdentifier}) {
    static_cast<void>(
        dynamic_cast<LocalRootEnumerator&>(
            *vessel->enumeratorForContainerItemIdentifier(container, LiveUpdates::unwanted).value())
            .appLibraryManager()
            .upgradeFromMainCache());
  }
  EXPECT_THAT(urlsOf(VesselRootContainerItemIdentifier), ElementsAre(fake.url(), library));
  EXPECT_THAT(urlsOf(VesselAllDirectoriesContainerItemIdentifier),
              ElementsAre(fake.url(), library));
  for (const std::string& label : log.sectionLabels())
    EXPECT_THAT(label, ::testing::Not(::testing::StartsWith("fetching URL"))) << "it is no item";
}

TEST_F(EnumeratorForContainerTest, UnknownContainerIsTheLookupsError) {
  EXPECT_EQ(vessel->enumeratorForContainerItemIdentifier("fid=4711").error(),
            Error::nonExistentItem("fid=4711"));
  LocalVessel withoutChanges{fake.platform(), libraries, libraries};
  EXPECT_TRUE(withoutChanges.enumeratorForContainerItemIdentifier(VesselRootContainerItemIdentifier)
                  .error()
                  .isPosix(ENOTSUP));
}

// Whoever is told that an enumeration finished may take the provider down while the enumerator is
// still held on the way back from that.
TEST_F(EnumeratorForContainerTest, LiveUpdatesEndWithTheProvider) {
  const auto enumerator = rootEnumerator();
  SerialQueue queue = notifierQueue(*enumerator);
  queue.sync([] {});
  EXPECT_EQ(events.runningStreams(), 1U);
  vessel.reset();
  EXPECT_EQ(events.runningStreams(), 0U);
}

TEST_F(EnumeratorForContainerTest, LiveUpdatesRunFromTheStartUntilInvalidated) {
  const auto enumerator = rootEnumerator();
  SerialQueue queue = notifierQueue(*enumerator);
  queue.sync([] {});
  const std::size_t before = fake.signals.containers.size();
  events.append(fake.path("folder"));
  events.deliver();
  EXPECT_THAT(fake.signals.containers, SizeIs(before + 2));
  enumerator->invalidate();
  queue.sync([] {});
  EXPECT_EQ(events.runningStreams(), 0U);
}

}  // namespace
}  // namespace mirabel::testing
