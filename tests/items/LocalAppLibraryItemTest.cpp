#include "foundation/KeyedArchive.h"
#include "items/LocalAppLibraryItem.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

class LocalAppLibraryItemTest : public ItemsFixture {
 protected:
  static constexpr std::string_view documents = "/apps/draw/Documents";

  BundleProxy proxy = fake.install("org.example.draw", "/apps/draw", "Draw");
};

TEST_F(LocalAppLibraryItemTest, IdentityAndNameComeFromTheRegistry) {
  fake.volume.at(documents).attributes["com.norvane.lastuseddate#PS"] =
      keyedarchive::archiveDate({0, 0}).value();
  const auto made = LocalAppLibraryItem::create(context, proxy);
  ASSERT_TRUE(made);
  EXPECT_EQ(made->itemIdentifier(), "#org.example.draw");
  EXPECT_EQ(made->parentItemIdentifier(), VesselRootContainerItemIdentifier);
  EXPECT_EQ(made->filename(), "Draw");
  EXPECT_EQ(made->url().path(), documents);
  EXPECT_EQ(made->capabilities(), 3U);
  EXPECT_EQ(made->lastUsedDate(), std::nullopt);
  EXPECT_EQ(made->docID(), std::nullopt);
  EXPECT_EQ(made->vs_beaconDomainIdentifier(), std::nullopt);
  EXPECT_EQ(made->vs_appContainerBundleIdentifier(), "org.example.draw");
  EXPECT_TRUE(made->vs_isContainer());
  EXPECT_TRUE(made->description().starts_with("<LocalAppLibraryItem itemIdentifier: #org"));
}

TEST_F(LocalAppLibraryItemTest, ProxyMayLackAllButItsContainer) {
  proxy.bundleIdentifier.reset();
  proxy.localizedName.reset();
  const auto made = LocalAppLibraryItem::create(context, proxy);
  ASSERT_TRUE(made);
  EXPECT_EQ(made->itemIdentifier(), "#(null)");
  EXPECT_EQ(made->filename(), "Documents");
  EXPECT_EQ(made->vs_appContainerBundleIdentifier(), std::nullopt);

  proxy.dataContainerURL.reset();
  EXPECT_FALSE(LocalAppLibraryItem::create(context, proxy));
  EXPECT_THAT(log.lines(),
              ElementsAre(LogLine{
                  LogLevel::error,
                  "[ERROR] can't create an app library item without a data container URL"}));
}

TEST_F(LocalAppLibraryItemTest, HiddenEntriesAreNoChildren) {
  const std::pair<std::vector<std::string>, std::uint16_t> cases[] = {
      {{}, 0},
      {{"Inbox"}, 0},
      {{"Inbox", ".Trash"}, 0},
      {{".Trash"}, 0},
      {{"a", "Inbox"}, 1},
      {{"a", ".hidden"}, 2},
      {{"a", "inbox"}, 2},
      {{"a", "b", ".Trash", "Inbox"}, 2},
  };
  for (const auto& [names, count] : cases) {
    fake.volume.at(documents).entries.clear();
    for (const std::string& name : names) {
      fake.volume.makeFolder(std::string(documents) + "/" + name);
    }
    EXPECT_EQ(LocalAppLibraryItem::create(context, proxy)->childItemCount(), count);
  }
  // A folder that tells of no entries is not asked for the hidden ones.
  fake.volume.at(documents).linkCount = 2;
  EXPECT_EQ(LocalAppLibraryItem::create(context, proxy)->childItemCount(), 0);
  EXPECT_TRUE(log.lines().empty());
  // Both came after the entries were counted.
  fake.volume.at(documents).linkCount = 3;
  EXPECT_EQ(LocalAppLibraryItem::create(context, proxy)->childItemCount(), 0);
}

}  // namespace
}  // namespace mirabel::testing
