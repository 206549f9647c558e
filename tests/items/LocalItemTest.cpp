#include <cerrno>

#include "foundation/KeyedArchive.h"
#include "items/LocalItem.h"
#include "mirabel/TagData.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::string_view lastUsedAttribute = "com.norvane.lastuseddate#PS";
constexpr std::string_view tagsAttribute = "com.norvane.metadata:_kMDItemUserTags";
constexpr std::string_view rankAttribute = "com.norvane.favorite-rank.number#PS";
constexpr std::string_view putBackAttribute = "com.norvane.trash.putback#PS";
constexpr std::size_t always = 1000;

class LocalItemTest : public ItemsFixture {
 protected:
  std::shared_ptr<LocalItem> item(std::string_view name, ItemOverrides overrides = {}) {
    return LocalItem::create(context, fake.url(name), std::move(overrides));
  }
  FakeNode& file(std::string_view name, std::string_view contents = {}) {
    return fake.volume.writeFile(fake.path(name), contents);
  }
  FakeNode& folder(std::string_view name) { return fake.volume.makeFolder(fake.path(name)); }
  static void set(FakeNode& node, std::string_view attribute, Data value) {
    node.attributes[std::string(attribute)] = std::move(value);
  }
};

TEST_F(LocalItemTest, FileTellsEverythingOfItself) {
  FakeNode& parent = folder("sub");
  FakeNode& node = file("sub/notes.txt", "12345");
  set(node, lastUsedAttribute, keyedarchive::archiveDate({1'700'000'200, 0}).value());
  set(node, tagsAttribute, keyedarchive::archiveStrings({"Red", "Work"}).value());
  set(node, rankAttribute, keyedarchive::archiveNumber(Number::of(2.5)).value());

  const auto made = item("sub/notes.txt");
  ASSERT_TRUE(made);
  EXPECT_EQ(made->itemIdentifier(), "did=1");
  EXPECT_EQ(made->parentItemIdentifier(), "fid=" + std::to_string(parent.fileID));
  EXPECT_EQ(made->filename(), "notes.txt");
  EXPECT_EQ(made->typeIdentifier(), "text/plain");
  EXPECT_EQ(made->documentSize(), Number::of(std::uint64_t{5}));
  EXPECT_EQ(made->creationDate(), node.created);
  EXPECT_EQ(made->contentModificationDate(), node.modified);
  EXPECT_EQ(made->childItemCount(), std::nullopt);
  EXPECT_EQ(made->capabilities(), 63U);
  EXPECT_EQ(made->versionIdentifier(), std::nullopt);
  EXPECT_FALSE(made->isTrashed());
  EXPECT_EQ(made->lastUsedDate(), (Date{1'700'000'200, 0}));
  EXPECT_EQ(decodeTagData(made->tagData().value()), (std::vector<Tag>{{"Red"}, {"Work"}}));
  EXPECT_EQ(made->favoriteRank(), Number::of(2.5));
  EXPECT_EQ(made->fileID(), node.fileID);
  EXPECT_EQ(made->docID(), 1U);
  EXPECT_FALSE(made->vs_isContainer());
  EXPECT_EQ(made->vs_beaconDomainIdentifier(), std::nullopt);
  EXPECT_EQ(made->description(), "<LocalItem itemIdentifier: did=1, parentItemIdentifier: " +
                                     made->parentItemIdentifier() + ", filename: notes.txt>");
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(LocalItemTest, KindAndTypeDecideSizeCountAndCapabilities) {
  folder("folder");
  file("folder/a");
  folder("folder/b");
  folder("empty");
  folder("locked").isWritable = false;
  file("read-only", "1").isWritable = false;
  for (const char* package : {"a.quill", "b.lumen", "c.bundle"})
    folder(package);
  file("a.quill/x", "1234567");
  file("b.lumen/x", "12");
  file("c.bundle/x", "1");
  fake.volume.makeFifo(fake.path("fifo"));
  struct Case {
    std::string_view name;
    std::optional<std::uint64_t> size;
    std::optional<std::uint16_t> children;
    std::uint64_t capabilities;
    bool isContainer;
  };
  const Case cases[] = {
      {"folder", {}, 2, 63, true},     {"empty", {}, 0, 63, true},    {"locked", {}, 0, 1, true},
      {"read-only", 1, {}, 1, false},  {"a.quill", 7, {}, 63, false}, {"b.lumen", 2, {}, 63, false},
      {"c.bundle", {}, {}, 63, false}, {"fifo", {}, {}, 63, false},
  };
  for (const Case& c : cases) {
    const auto made = item(c.name);
    ASSERT_TRUE(made) << c.name;
    EXPECT_EQ(made->documentSize(), c.size ? std::optional(Number::of(*c.size)) : std::nullopt)
        << c.name;
    EXPECT_EQ(made->childItemCount(), c.children) << c.name;
    EXPECT_EQ(made->capabilities(), c.capabilities) << c.name;
    EXPECT_EQ(made->vs_isContainer(), c.isContainer) << c.name;
  }
  fake.faults.fail(Op::directorySize, Error::posix(EACCES));
  EXPECT_EQ(item("a.quill")->documentSize(), std::nullopt);
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(LocalItemTest, RootContainerIsItsOwnParentAndCanOnlyBeRead) {
  const auto root = item("");
  ASSERT_TRUE(root);
  EXPECT_EQ(root->itemIdentifier(), VesselRootContainerItemIdentifier);
  EXPECT_EQ(root->parentItemIdentifier(), VesselRootContainerItemIdentifier);
  EXPECT_EQ(root->filename(), "Documents");
  EXPECT_EQ(root->capabilities(), 1U);
}

TEST_F(LocalItemTest, MissingPiecesRefuseTheItem) {
  file("f");
  folder("Inbox");
  const auto refused = [&](std::string_view name, ItemOverrides overrides, std::string line) {
    log.clear();
    EXPECT_FALSE(LocalItem::create(context, fake.url(name), std::move(overrides))) << line;
    ASSERT_FALSE(log.lines().empty());
    EXPECT_EQ(log.lines().back(), (LogLine{LogLevel::error, "[ERROR] " + line}));
  };
  ItemOverrides onlyItem;
  onlyItem.customItemID = "fid=7";
  ItemOverrides both = onlyItem;
  both.customParentItemID = "fid=6";
  ItemOverrides named = both;
  named.customFilename = "Name";

  refused("missing", {}, "can't create an item without an ID");
  refused("Inbox", {}, "can't create an item for the \"Inbox\" directory");
  refused("missing/f", onlyItem,
          "can't create an item without a parent ID (itemIdentifier: fid=7)");
  refused("missing", both,
          "can't create an item without a filename (itemIdentifier: fid=7, parentItemIdentifier: "
          "fid=6)");
  refused("missing", named,
          "can't create an item without a type identifier (itemIdentifier: fid=7, "
          "parentItemIdentifier: fid=6, filename: Name)");
  // A name that only reads "Inbox" is no reason.
  named.customFilename = "Inbox";
  EXPECT_TRUE(item("f", named));
}

TEST_F(LocalItemTest, UndecodableAttributesCountAsUnset) {
  FakeNode& node = file("f");
  for (const std::string_view name : {lastUsedAttribute, tagsAttribute, rankAttribute}) {
    set(node, name, dataFromString("junk"));
  }
  const auto made = item("f");
  EXPECT_EQ(made->lastUsedDate(), std::nullopt);
  EXPECT_EQ(made->favoriteRank(), std::nullopt);
  EXPECT_EQ(made->tagData(), Data{});
  node.attributes.clear();
  EXPECT_EQ(item("f")->tagData(), std::nullopt);
  // A date in the place of the list, a list in the place of the number.
  set(node, tagsAttribute, keyedarchive::archiveDate({0, 0}).value());
  set(node, rankAttribute, keyedarchive::archiveStrings({}).value());
  EXPECT_EQ(item("f")->tagData(), Data{});
  EXPECT_EQ(item("f")->favoriteRank(), std::nullopt);
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(LocalItemTest, FailingStatusLeavesTheFileIDOut) {
  folder("f");
  for (const auto& [code, level] : {std::pair(ENOENT, LogLevel::debug), {EIO, LogLevel::error}}) {
    log.clear();
    fake.faults.fail(Op::status, Error::posix(code));
    const auto made = item("f");
    ASSERT_TRUE(made);
    EXPECT_EQ(made->fileID(), std::nullopt);
    EXPECT_EQ(made->childItemCount(), std::nullopt);
    const std::string word = level == LogLevel::debug ? "[DEBUG] " : "[ERROR] ";
    EXPECT_THAT(log.lines(),
                ElementsAre(LogLine{level, word + "can't find fileID for item \"" + fake.path("f") +
                                               "\"; " + Error::posix(code).description()}));
  }
}

TEST_F(LocalItemTest, LinkCountBelowTwoStopsTheProcess) {
  folder("f").linkCount = 1;
  EXPECT_DEATH(
      {
        Log::shared().setSink(nullptr, LogLevel::error);
        static_cast<void>(item("f"));
      },
      "link count");
}

TEST_F(LocalItemTest, OwnerIsLookedUpOnlyForItemsWithASearchDomain) {
  fake.install("org.example.draw", "/apps/draw");
  fake.volume.writeFile("/apps/draw/Documents/f");
  file("f");
  const URL owned = URL::fileURL("/apps/draw/Documents/f");
  ItemOverrides flagged;
  flagged.bundleIdentifier = "passed";
  ItemOverrides unflagged = flagged;
  unflagged.hasBeaconDomainIdentifier = false;

  const auto found = LocalItem::create(context, owned, flagged);
  EXPECT_EQ(found->vs_beaconDomainIdentifier(), "org.example.draw");
  EXPECT_EQ(found->vs_appContainerBundleIdentifier(), "org.example.draw");
  for (const auto& made : {LocalItem::create(context, owned, unflagged), item("f", flagged)}) {
    EXPECT_EQ(made->vs_beaconDomainIdentifier(), std::nullopt);
    EXPECT_EQ(made->vs_appContainerBundleIdentifier(), "passed");
  }
}

TEST_F(LocalItemTest, PutBackURLStaysInTheLibrary) {
  fake.install("org.example.draw", "/apps/draw");
  const std::string library = "/apps/draw/Documents";
  FakeNode& node = fake.volume.makeFolder(library + "/.Trash/f");
  const auto putBack = [&]() -> std::string {
    log.clear();
    const auto made = LocalItem::create(context, URL::fileURL(library + "/.Trash/f"));
    EXPECT_TRUE(made->isTrashed());
    static_cast<void>(made->putBackURL());
    return made->putBackURL() ? made->putBackURL()->path() : "nothing";
  };
  EXPECT_EQ(putBack(), "nothing");
  EXPECT_THAT(log.lines(),
              ElementsAre(LogLine{LogLevel::debug, "[DEBUG] couldn't find putback xattr for " +
                                                       library + "/.Trash/f"}));
  for (const std::string_view inside : {"a.txt", "Notes/a.txt", "Notes/\xff..", "..."}) {
    set(node, putBackAttribute, keyedarchive::archiveString(inside).value());
    EXPECT_EQ(putBack(), library + "/" + std::string(inside));
    EXPECT_THAT(log.lines(), IsEmpty());
  }
  using namespace std::string_view_literals;
  std::vector<Data> hostile = {dataFromString("junk"), keyedarchive::archiveStrings({"a"}).value()};
  for (const std::string_view path : {""sv, "/etc/passwd"sv, ".."sv, "../x"sv, "a/../../x"sv,
                                      "./a"sv, "a//b"sv, "a/"sv, "a\0b"sv}) {
    if (auto archived = keyedarchive::archiveString(path)) hostile.push_back(*archived);
  }
  for (const Data& bytes : hostile) {
    set(node, putBackAttribute, bytes);
    EXPECT_EQ(putBack(), "nothing");
    EXPECT_THAT(log.lines(),
                ElementsAre(LogLine{LogLevel::error, "[ERROR] couldn't compute putback url"}));
  }
  set(file("f"), putBackAttribute, keyedarchive::archiveString("a").value());
  EXPECT_FALSE(item("f")->putBackURL());
}

TEST_F(LocalItemTest, PrefetchedListingLooksAtEachEntryOnce) {
  folder("many");
  std::vector<URL> urls;
  const URL parent = fake.url("many");
  for (int i = 0; i < 10; ++i) {
    file("many/" + std::to_string(i)).documentID = static_cast<std::uint32_t>(1000 + i);
    urls.push_back(parent.appendingPathComponent(std::to_string(i)));
  }
  ASSERT_TRUE(fake.platform().resources.prefetch(urls));
  fake.faults.reset();
  for (const URL& url : urls)
    ASSERT_TRUE(LocalItem::create(context, url));
  // What is left is the status of each, answered from its cache, and one look at the parent.
  EXPECT_EQ(fake.faults.calls(Op::status), 10U);
  EXPECT_EQ(fake.faults.calls(Op::readValues), 1U);
  EXPECT_EQ(fake.faults.calls(), 11U);
}

TEST_F(LocalItemTest, AnyFailingCallLeavesARightItemOrALoggedNothing) {
  folder("sub");
  for (const std::string_view name : {"sub/f.txt", "sub/a.quill", "sub/plain"}) {
    FakeNode& node = name.ends_with("txt") ? file(name, "123") : folder(name);
    set(node, tagsAttribute, keyedarchive::archiveStrings({"Red"}).value());
    const auto whole = item(name);
    ASSERT_TRUE(whole);
    for (std::size_t n = 1; n < always; ++n) {
      fake.faults.reset();
      node.documentID = 0;
      fake.faults.failCall(n, Error::posix(EIO));
      log.clear();
      const auto made = item(name);
      if (fake.faults.calls() < n) break;
      if (!made) {
        EXPECT_FALSE(log.lines().empty()) << name << " " << n;
        continue;
      }
      // A document gets a new ID each time round.
      const std::string expected = name == "sub/plain" ? whole->itemIdentifier() : "did=";
      EXPECT_TRUE(made->itemIdentifier().starts_with(expected)) << n;
      EXPECT_EQ(made->parentItemIdentifier(), whole->parentItemIdentifier()) << n;
      EXPECT_EQ(made->filename(), whole->filename()) << n;
      EXPECT_EQ(made->typeIdentifier(), whole->typeIdentifier()) << n;
      EXPECT_EQ(made->capabilities(), whole->capabilities()) << n;
      const bool isWhole = made->tagData() == whole->tagData() && made->fileID() == whole->fileID();
      EXPECT_TRUE(isWhole || !log.lines().empty()) << name << " " << n;
    }
  }
}

}  // namespace
}  // namespace mirabel::testing
