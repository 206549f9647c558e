#include "applibrary/AppLibraryFixture.h"
#include "applibrary/MRBAppLibraryManager.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;

/// What a registry may tell because somebody wrote an entry into it.
class HostileRecordsTest : public AppLibraryFixture {
 protected:
  void put(std::optional<std::string> identifier, std::string_view container) {
    fake.install("", container, "Name");
    fake.applications.installed.back().bundleIdentifier = std::move(identifier);
  }
  std::vector<std::string> shownLibraries() {
    shared.refreshFromRegistry();
    shared.upgradeFromMainCache();
    std::vector<std::string> texts;
    for (const auto& item : shared.shared().appLibraries())
      texts.push_back(item->itemIdentifier() + " " + item->fileURL().path());
    return texts;
  }

  MRBAppLibraryManager shared{fake.platform()};
};

TEST_F(HostileRecordsTest, IdentifierIsNoPath) {
  const char* identifiers[] = {"..",     "../../me/Documents", "a/b",     "", "#", "fid=1",
                               "(null)", "new\nline",          "\xff\xfe"};
  std::vector<std::string> expected;
  int number = 0;
  for (const char* identifier : identifiers) {
    const std::string container = "/apps/" + std::to_string(number++);
    put(identifier, container);
    expected.push_back("#" + std::string(identifier) + " " + container + "/Documents");
  }
  EXPECT_THAT(shownLibraries(), ElementsAreArray(expected));
  EXPECT_EQ(shared.shared().appLibraryWithItemIdentifier("#..")->url().path(), "/apps/0/Documents");
}

TEST_F(HostileRecordsTest, FolderThatBelongsToAnotherIsNotTakenOver) {
  put("first", "/apps/first");
  put("deep", "/apps/x/y/Documents/z");
  const std::pair<const char*, const char*> refused[] = {
      {"same.folder", "/apps/first"},
      {"inside", "/apps/first/Documents/sub"},
      {"around", "/apps/x/y"},
      {"storage", "/home/me"},
      {"inside.storage", "/home/me/Documents/sub"},
      {"dots", "/apps/../home/me"},
      {"dot", "/apps/./first"},
  };
  for (const auto& [identifier, container] : refused)
    put(identifier, container);
  put("first", "/apps/second");
  put("beside", "/apps/first/Documents2");
  put({}, "/apps/unnamed");
  put({}, "/apps/unnamed.too");
  EXPECT_THAT(
      shownLibraries(),
      ElementsAre("#first /apps/first/Documents", "#deep /apps/x/y/Documents/z/Documents",
                  "#beside /apps/first/Documents2/Documents", "#(null) /apps/unnamed/Documents"));
  const auto texts = messages();
  for (const BundleProxy& record : fake.applications.installed) {
    const std::string line = "[DEBUG] can't create app library for " + record.description();
    const bool isShown =
        shared.shared().bundleProxyWithRootURL(documentFolderOf(*record.dataContainerURL)) &&
        record.bundleIdentifier != "same.folder";
    EXPECT_EQ(std::ranges::count(texts, line), isShown ? 0 : 1) << line;
  }
  EXPECT_EQ(shared.rootURLsForAppLibraries()->size(), 4U);
}

TEST_F(HostileRecordsTest, StorageBelowALibraryIsRefusedToo) {
  FakePlatform nested("/apps/host/Documents/me/Documents");
  nested.install("around", "/apps/host");
  MRBAppLibraryManager manager(nested.platform());
  ASSERT_TRUE(manager.refreshFromRegistry());
  EXPECT_TRUE(manager.upgradeFromMainCache());
  EXPECT_TRUE(manager.rootURLsForAppLibraries()->empty());
}

TEST_F(HostileRecordsTest, RecordWithoutAContainerOrFolderIsLeftOut) {
  for (const char* name : {"gone", "file", "link"}) {
    put(name, std::string("/apps/") + name);
    fake.volume.remove(std::string("/apps/") + name + "/Documents");
  }
  put("good", "/apps/good");
  fake.volume.writeFile("/apps/file/Documents");
  fake.volume.makeSymlink("/apps/link/Documents", "/home/me/Documents");
  EXPECT_THAT(shownLibraries(), ElementsAre("#good /apps/good/Documents"));
  // As only a cache that somebody else wrote can have it.
  ASSERT_TRUE(shared.caches().main.save({BundleProxy{"bare", {}, {}}}, 0,
                                        LocalAppLibraryCache::Increment::yes));
  messages();
  EXPECT_TRUE(shared.upgradeFromMainCache());
  EXPECT_THAT(messages(),
              ::testing::IsSupersetOf(
                  {"[ERROR] can't create an app library item without a data container URL",
                   "[DEBUG] can't create app library for <BundleProxy bundleIdentifier: bare, "
                   "dataContainerURL: (null)>"}));
  EXPECT_TRUE(shared.rootURLsForAppLibraries()->empty());
}

}  // namespace
}  // namespace mirabel::testing
