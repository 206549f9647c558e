#include <cerrno>

#include "applibrary/AppLibraryFixture.h"
#include "applibrary/LocalAppLibraryManager.h"
#include "applibrary/MRBAppLibraryManager.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using Increment = LocalAppLibraryCache::Increment;

class LocalAppLibraryManagerTest : public AppLibraryFixture {
 protected:
  /// A refresh and an upgrade, as they follow each other on every notification.
  bool follow(VesselChangeObserver* observer = nullptr) {
    shared.refreshFromRegistry();
    return shared.upgradeFromMainCache(observer);
  }
  std::vector<std::string> identifiers() {
    std::vector<std::string> texts;
    for (const auto& item : manager.appLibraries())
      texts.push_back(item->itemIdentifier());
    return texts;
  }

  MRBAppLibraryManager shared{fake.platform()};
  LocalAppLibraryManager& manager = shared.shared();
};

TEST_F(LocalAppLibraryManagerTest, DeletedDomainsLeaveTheIndexBeforeTheNewAnswersAreGiven) {
  install("org.a");
  ASSERT_TRUE(follow());
  fake.applications.installed.clear();
  fake.signals.deletionRefusal = Error::posix(EIO);
  EXPECT_TRUE(follow());
  EXPECT_EQ(fake.signals.deletedDomains.size(), 1U);
  const auto texts = messages();
  ASSERT_GE(texts.size(), 3U);
  EXPECT_EQ(texts[texts.size() - 3],
            "[DEBUG] asking provider manager to delete index from deleted domains");
  EXPECT_EQ(texts.back(),
            "[DEBUG] upgraded manager <LocalAppLibraryManager cacheSource: working-set cache, "
            "versionToken: 2, appLibraries: 0>");
  // Nothing gone, nothing asked.
  install("org.b");
  EXPECT_TRUE(follow());
  EXPECT_EQ(fake.signals.deletedDomains.size(), 1U);
}

TEST_F(LocalAppLibraryManagerTest, AnswersForFoldersAndWhatLiesInThem) {
  fake.install("org.var", "/var/apps/v", "V");
  install("org.a");
  ASSERT_TRUE(follow());
  EXPECT_THAT(*manager.rootURLsForAppLibraries(),
              ElementsAre(URL::fileURL("/private/var/apps/v/Documents"),
                          URL::fileURL("/apps/org.a/Documents")));
  const std::pair<const char*, const char*> cases[] = {
      {"/apps/org.a/Documents/x", "org.a"},
      {"/apps/org.a/Documents/.Trash/x/y", "org.a"},
      {"/var/apps/v/Documents/x", "org.var"},
      {"/private/var/apps/v/Documents/x", "org.var"},
      {"/apps/org.a/Documents", "-"},
      {"/apps/org.a/Documents2/x", "-"},
      {"/apps/org.a/x", "-"},
      {"/apps/org.a/Documents/../x", "-"},
      {"/", "-"},
  };
  for (const auto& [path, owner] : cases) {
    const auto record = shared.applicationOwning(URL::fileURL(path));
    EXPECT_EQ(record ? record->bundleIdentifier.value_or("?") : "-", owner) << path;
  }
  EXPECT_FALSE(shared.applicationOwning(URL::fromString("https://example.org/Documents/x")));
  EXPECT_EQ(manager.bundleProxyWithRootURL(URL::fileURL("/var/apps/v/Documents"))
                .value()
                .bundleIdentifier,
            "org.var");
  EXPECT_FALSE(manager.bundleProxyWithRootURL(URL::fileURL("/apps/org.a")));
  EXPECT_EQ(manager.appLibraryWithItemIdentifier("#org.a")->url().path(), "/apps/org.a/Documents");
  EXPECT_EQ(manager.appLibraryWithItemIdentifier("org.a"), nullptr);
}

TEST_F(LocalAppLibraryManagerTest, ReportedLibraryIsThatOfNow) {
  install("org.a", "Old");
  install("org.b", "B");
  ASSERT_TRUE(follow());
  fake.applications.installed[0].localizedName = "New";
  fake.volume.writeFile("/apps/org.a/Documents/letter", "");
  EXPECT_FALSE(follow());
  const auto item = manager.appLibraryWithItemIdentifier("#org.a");
  EXPECT_EQ(item->filename(), "New");
  EXPECT_EQ(item->childItemCount(), 1);
  EXPECT_EQ(manager.appLibraries().front()->filename(), "New");
  // One that can't be reached is not reported, and is back when its folder is.
  fake.volume.remove("/apps/org.a/Documents");
  EXPECT_THAT(identifiers(), ElementsAre("#org.b"));
  EXPECT_EQ(manager.appLibraryWithItemIdentifier("#org.a"), nullptr);
  fake.volume.makeFolder("/apps/org.a/Documents");
  EXPECT_THAT(identifiers(), ElementsAre("#org.a", "#org.b"));
}

TEST_F(LocalAppLibraryManagerTest, LibraryThatCannotBeReadNowIsNotDeleted) {
  install("org.a", "A");
  install("org.b", "B");
  ASSERT_TRUE(follow());
  ASSERT_TRUE(shared.caches().main.save(manager.content().records, 0, Increment::yes));
  ChangeLog changes;
  fake.faults.fail(Op::readValues, Error::posix(EMFILE), 1, 1'000);
  EXPECT_TRUE(shared.upgradeFromMainCache(&changes));
  EXPECT_THAT(changes.calls, ElementsAre("update A B"));
  EXPECT_THAT(identifiers(), ElementsAre("#org.a", "#org.b"));
  fake.faults.reset();

  ASSERT_TRUE(shared.caches().main.save(manager.content().records, 0, Increment::yes));
  fake.volume.remove("/apps/org.a/Documents");
  changes.calls.clear();
  EXPECT_TRUE(shared.upgradeFromMainCache(&changes));
  EXPECT_THAT(changes.calls, ElementsAre("update B", "delete #org.a"));
}

TEST_F(LocalAppLibraryManagerTest, NextProcessStartsWithTheCacheOfItsSource) {
  install("org.a", "A");
  ASSERT_TRUE(follow());
  const auto content = manager.content();
  ASSERT_TRUE(
      shared.caches().workingSet.save(content.records, content.versionToken, Increment::no));
  install("org.b", "B");
  ASSERT_TRUE(shared.refreshFromRegistry());

  MRBAppLibraryManager next(fake.platform());
  EXPECT_EQ(next.shared().versionToken(), 1U);
  EXPECT_EQ(next.shared().appLibraries().size(), 1U);
  LocalAppLibraryManager ofRoot(fake.platform(), next.caches(), LocalAppLibraryCacheSource::main);
  EXPECT_EQ(ofRoot.versionToken(), 2U);
  EXPECT_EQ(ofRoot.cacheSource(), LocalAppLibraryCacheSource::main);
  EXPECT_EQ(ofRoot.appLibraries().size(), 2U);
  EXPECT_FALSE(next.refreshFromRegistry());
  EXPECT_TRUE(next.upgradeFromMainCache());
  EXPECT_EQ(next.shared().versionToken(), 2U);
}

TEST_F(LocalAppLibraryManagerTest, ManagerThatIsAheadOfTheMainCacheSaysSoAndFollows) {
  install("org.a", "A");
  ASSERT_TRUE(follow());
  const auto content = manager.content();
  ASSERT_TRUE(shared.caches().workingSet.save(content.records, 9, Increment::no));
  fake.caches.files.erase(mainCachePath);

  MRBAppLibraryManager next(fake.platform());
  log.clear();
  ChangeLog changes;
  EXPECT_TRUE(next.upgradeFromMainCache(&changes));
  EXPECT_EQ(log.messages().front(),
            (LogLine{LogLevel::error,
                     "[ERROR] version token shouldn't be greater than the main's cache version (9 "
                     "vs 0); <LocalAppLibraryManager cacheSource: working-set cache, versionToken: "
                     "9, appLibraries: 1>"}));
  EXPECT_THAT(changes.calls, ElementsAre("delete #org.a"));
  EXPECT_EQ(next.shared().versionToken(), 0U);
  // The number 1 had a meaning before the cache was lost.
  EXPECT_TRUE(next.refreshFromRegistry());
  EXPECT_TRUE(next.upgradeFromMainCache(&changes));
  EXPECT_EQ(next.shared().versionToken(), 2U);
  EXPECT_EQ(changes.calls.back(), "update A");
}

TEST_F(LocalAppLibraryManagerTest, TwoProcessesEndWithWhatTheRegistrySays) {
  MRBAppLibraryManager other(fake.platform());
  const auto followOther = [&] {
    other.refreshFromRegistry();
    other.upgradeFromMainCache();
  };
  install("org.a");
  // The other sees a later registry, and its later content is overwritten by this one's.
  fake.caches.afterClaim = [&] {
    install("org.b");
    followOther();
  };
  follow();
  EXPECT_EQ(manager.versionToken(), 1U);
  EXPECT_EQ(other.shared().versionToken(), 2U);
  for (int round = 0; round < 2; ++round) {
    followOther();
    follow();
  }
  EXPECT_EQ(manager.versionToken(), other.shared().versionToken());
  EXPECT_THAT(identifiers(), ElementsAre("#org.a", "#org.b"));
  EXPECT_EQ(other.shared().appLibraries().size(), 2U);
  EXPECT_FALSE(follow());
}

TEST_F(LocalAppLibraryManagerTest, ChangeOfOneAmongTenThousandCostsOne) {
  constexpr std::size_t count = 10'000;
  log.clear();
  Log::shared().setSink(nullptr, LogLevel::error);
  const auto add = [&](std::size_t i) {
    fake.install("org.a" + std::to_string(i),
                 "/apps/" + std::to_string(i / 100) + "/" + std::to_string(i % 100), "Name");
  };
  for (std::size_t i = 0; i < count; ++i)
    add(i);
  fake.faults.reset();
  ASSERT_TRUE(shared.refreshFromRegistry());
  // Two enumerations, one look at each application; the cache is read, numbered and written.
  EXPECT_EQ(fake.faults.calls(), count + 6);

  fake.faults.reset();
  ASSERT_TRUE(shared.upgradeFromMainCache());
  EXPECT_EQ(manager.rootURLsForAppLibraries()->size(), count);
  EXPECT_EQ(fake.faults.calls(Op::readValues), count);
  EXPECT_LE(fake.faults.calls(), 8 * count);

  add(count);
  fake.faults.reset();
  ASSERT_TRUE(follow());
  EXPECT_EQ(fake.faults.calls(Op::readValues), 1U);
  EXPECT_EQ(fake.faults.calls(Op::status), 1U);
  EXPECT_LE(fake.faults.calls(), count + 1 + 6 + 1 + 8);

  fake.faults.reset();
  EXPECT_FALSE(follow());
  EXPECT_EQ(fake.faults.calls(), count + 1 + 3);
}

}  // namespace
}  // namespace mirabel::testing
