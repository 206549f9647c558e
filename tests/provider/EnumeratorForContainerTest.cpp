#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "enumeration/LocalFileEnumerator.h"
#include "provider/LocalVessel.h"
#include "support/FakeAppLibraries.h"
#include "support/FakeEventStreams.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;

class NoChanges final : public ChangesEnumerations {
 public:
  std::shared_ptr<ChangesEnumeration> make(const FSChangeToken&, const std::string&,
                                           const std::vector<URL>&,
                                           std::shared_ptr<VesselChangeObserver>) override {
    return nullptr;
  }
};

class EnumeratorForContainerTest : public ::testing::Test {
 protected:
  EnumeratorForContainerTest() {
    fake.install("org.example.draw", "/apps/draw", "Draw");
    fake.volume.makeFolder(fake.path("folder"));
  }
  std::vector<URL> urlsOf(std::string_view container) {
    const auto enumerator = vessel.enumeratorForContainerItemIdentifier(container);
    if (!enumerator) return {};
    const auto& files = dynamic_cast<LocalFileEnumerator&>(**enumerator);
    EXPECT_EQ(files.container(), container);
    return files.urls();
  }

  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  FakeEventStreams events;
  NoChanges changes;
  LocalVessel vessel{fake.platform(), libraries, libraries,
                     ChangeServices{events, fake.diagnostics, changes}};
  LogCapture log;
};

TEST_F(EnumeratorForContainerTest, EachContainerHasItsFolders) {
  const URL library = URL::fileURL("/apps/draw/Documents");
  const std::string folder = "fid=" + std::to_string(fake.volume.at(fake.path("folder")).fileID);
  EXPECT_THAT(urlsOf(folder), ElementsAre(fake.url("folder")));
  EXPECT_THAT(log.sectionLabels(),
              ElementsAre("enumerator for " + folder, "fetching URL for \"" + folder + "\""));
  EXPECT_THAT(urlsOf("#org.example.draw"), ElementsAre(library));
  EXPECT_THAT(urlsOf(VesselRootContainerItemIdentifier), ElementsAre(fake.url()));
  EXPECT_THAT(urlsOf(VesselTemporaryLocalFolderItemIdentifier),
              ElementsAre(fake.url(".TemporaryLocalFolder")));
  log.clear();
  EXPECT_THAT(urlsOf(VesselWorkingSetContainerItemIdentifier), ElementsAre(fake.url(), library));
  EXPECT_THAT(urlsOf(VesselAllDirectoriesContainerItemIdentifier),
              ElementsAre(fake.url(), library));
  EXPECT_THAT(log.sectionLabels(), SizeIs(2));  // these are no identifiers to look up
}

TEST_F(EnumeratorForContainerTest, UnknownContainerIsTheLookupsError) {
  EXPECT_EQ(vessel.enumeratorForContainerItemIdentifier("fid=4711").error(),
            Error::nonExistentItem("fid=4711"));
  LocalVessel withoutChanges{fake.platform(), libraries, libraries};
  EXPECT_TRUE(withoutChanges.enumeratorForContainerItemIdentifier(VesselRootContainerItemIdentifier)
                  .error()
                  .isPosix(ENOTSUP));
}

// Whoever is told that an enumeration finished may take the provider down while the enumerator is
// still held on the way back from that.
TEST_F(EnumeratorForContainerTest, LiveUpdatesEndWithTheProvider) {
  auto provider = std::make_unique<LocalVessel>(fake.platform(), libraries, libraries,
                                                ChangeServices{events, fake.diagnostics, changes});
  const auto enumerator =
      provider->enumeratorForContainerItemIdentifier(VesselRootContainerItemIdentifier).value();
  SerialQueue queue =
      dynamic_cast<LocalFileEnumerator&>(*enumerator).notifier()->reader()->streamQueue();
  queue.sync([] {});
  EXPECT_EQ(events.runningStreams(), 1U);
  provider.reset();
  EXPECT_EQ(events.runningStreams(), 0U);
}

TEST_F(EnumeratorForContainerTest, LiveUpdatesRunFromTheStartUntilInvalidated) {
  const auto enumerator =
      vessel.enumeratorForContainerItemIdentifier(VesselRootContainerItemIdentifier).value();
  SerialQueue queue =
      dynamic_cast<LocalFileEnumerator&>(*enumerator).notifier()->reader()->streamQueue();
  queue.sync([] {});
  events.append(fake.path("folder"));
  events.deliver();
  EXPECT_THAT(fake.signals.containers, SizeIs(2));
  enumerator->invalidate();
  queue.sync([] {});
  EXPECT_EQ(events.runningStreams(), 0U);
}

}  // namespace
}  // namespace mirabel::testing
