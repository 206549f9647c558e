#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <set>
#include <thread>

#include "cli/InstalledApps.h"
#include "host/HostedProvider.h"
#include "host/Searching.h"
#include "host/search/SearchFeeder.h"
#include "host/search/SearchFixture.h"
#include "host/search/SearchSchema.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using Names = std::vector<std::string>;

/// The rows of an index that is closed, one text for each. Of app libraries the working set tells
/// no more than that they come and go.
std::set<std::string> rowsOf(const std::string& folder) {
  const auto database = Database::open(folder + "/search.db").value();
  auto rows = database->prepare("SELECT " + std::string(searchColumns) + " FROM items").value();
  std::set<std::string> all;
  while (rows.step().value()) {
    std::string text(rows.blob(0));
    for (int i = 1; i < searchColumnCount && !text.starts_with('#'); ++i)
      text += " | " + (rows.isNull(i) ? "-" : std::string(rows.blob(i)));
    all.insert(text);
  }
  return all;
}

/// The provider of a home on disk, and an index of its working set.
class SearchFeederTest : public ::testing::Test {
 protected:
  SearchFeederTest() { fs::create_directory(indexFolder()); }
  void SetUp() override { start(); }

  [[nodiscard]] std::string indexFolder() const { return home.path() + "/index"; }
  void start() {
    index.reset();
    workingSet.reset();
    provider.reset();
    provider = HostedProvider::open({.home = home.path()}).value();
    const std::string container(VesselWorkingSetContainerItemIdentifier);
    workingSet = provider->vessel().enumeratorForContainerItemIdentifier(container).value();
    index = SearchIndex::open(indexFolder()).value();
  }
  void catchUp() {
    const auto done = SearchFeeder(*index).catchUp(*workingSet);
    ASSERT_TRUE(done) << done.error().description();
  }
  /// What the index holds is what one that is fed now would hold.
  void expectFresh(const char* after) {
    const std::string other = home.path() + "/fresh";
    fs::create_directory(other);
    {
      const auto fresh = SearchIndex::open(other).value();
      ASSERT_TRUE(SearchFeeder(*fresh).catchUp(*workingSet));
    }
    index.reset();
    EXPECT_EQ(rowsOf(indexFolder()), rowsOf(other)) << after;
    fs::remove_all(other);
    index = SearchIndex::open(indexFolder()).value();
  }
  Names find(const std::string& word) {
    Names names;
    const auto found = index->search({.words = {word}}).value();
    for (const std::string& identifier : found)
      names.push_back(provider->vessel().lookUpItem(identifier)->filename());
    return names;
  }
  void refreshLibraries() {
    MRBAppLibraryManager& libraries = provider->libraries();
    libraries.refreshFromRegistry();
    libraries.upgradeFromMainCache();
    libraries.followLibraries(provider->linuxPlatform().events());
  }

  TempHome home;
  LogCapture log{LogLevel::error};
  std::unique_ptr<HostedProvider> provider;
  std::shared_ptr<VesselEnumerator> workingSet;
  std::unique_ptr<SearchIndex> index;
};

TEST_F(SearchFeederTest, RowsEqualAFreshListingAfterEveryKindOfChange) {
  home.makeFolder("sub");
  for (int i = 0; i < 450; ++i)
    home.writeFile("sub/document " + std::to_string(i) + ".txt");
  catchUp();
  expectFresh("the first feed");
  EXPECT_THAT(find("449"), ElementsAre("document 449.txt"));

  home.rename("sub/document 3.txt", "sub/letter.txt");
  home.remove("sub/document 4.txt");
  home.writeFile("note.md", "text");
  catchUp();
  expectFresh("single changes");
  EXPECT_THAT(find("letter"), ElementsAre("letter.txt"));

  home.rename("sub", "moved");
  for (int i = 10; i < 160; ++i)
    home.remove("moved/document " + std::to_string(i) + ".txt");
  for (int i = 200; i < 350; ++i)
    home.writeFile("moved/document " + std::to_string(i) + ".txt", "more");
  catchUp();
  expectFresh("more than a batch");

  start();
  home.remove("note.md");
  catchUp();
  expectFresh("a restart");
  EXPECT_THAT(find("note"), IsEmpty());
}

TEST_F(SearchFeederTest, ADomainThatWasDeletedIsToldAgainWhenItComesBack) {
  const InstalledApps apps(home);
  apps.install("org.example.Draw", "Draw");
  apps.write("org.example.Draw", "drawing.txt", "text");
  refreshLibraries();
  catchUp();
  EXPECT_THAT(find("drawing"), ElementsAre("drawing.txt"));
  apps.remove("org.example.Draw");
  ASSERT_TRUE(index->deleteDomains({"org.example.Draw"}));
  refreshLibraries();
  EXPECT_THAT(index->search({.words = {"drawing"}}).value(), IsEmpty());
  catchUp();
  expectFresh("it was removed");
  apps.install("org.example.Draw", "Draw");
  refreshLibraries();
  catchUp();
  EXPECT_THAT(find("drawing"), ElementsAre("drawing.txt"));
  expectFresh("it came back");
}

TEST_F(SearchFeederTest, AnAnchorThatExpiredHasEverythingListedAgain) {
  home.writeFile("kept.txt");
  catchUp();
  const auto kept = provider->vessel().persistentIdentifierForItemAtURL(home.url("kept.txt"));
  ASSERT_TRUE(index->apply({}, {*kept}, anchorOf("no anchor")));
  EXPECT_THAT(find("kept"), IsEmpty());
  catchUp();
  EXPECT_THAT(find("kept"), ElementsAre("kept.txt"));
  expectFresh("an anchor that nobody gave");
}

/// A container whose answers are scripted.
class ScriptedSet final : public VesselEnumerator {
 public:
  explicit ScriptedSet(VesselItems items) : items_(std::move(items)) {}

  void enumerateItems(VesselEnumerationObserver& observer, const Data& page) override {
    const bool isFirst = stringView(page) == VesselInitialPageSortedByName;
    calls.emplace_back(isFirst ? "first" : "next");
    if (whilePage) whilePage();
    observer.didEnumerateItems({items_[isFirst ? 0 : 1]});
    if (isFirst) return observer.finishEnumeratingUpToPage(anchorOf("2"));
    if (pageErrors.empty()) return observer.finishEnumeratingUpToPage(std::nullopt);
    observer.finishEnumeratingWithError(pageErrors.back());
    pageErrors.pop_back();
  }
  void enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                        const Data& anchor) override {
    calls.emplace_back("since " + std::string(stringView(anchor)));
    waiting = observer;
    if (!answers) return;
    observer->didUpdateItems({items_[2]});
    if (!changeError) return observer->finishEnumeratingChangesUpToSyncAnchor(anchorOf("c"), false);
    observer->finishEnumeratingWithError(*changeError);
  }
  void currentSyncAnchor(const std::function<void(std::optional<Data>)>& handler) override {
    calls.emplace_back("anchor");
    handler(hasAnchor ? std::optional(anchorOf("a")) : std::nullopt);
  }
  void invalidate() override {}

  std::vector<std::string> calls;
  std::vector<Error> pageErrors;
  std::optional<Error> changeError;
  std::function<void()> whilePage;
  bool hasAnchor = true;
  bool answers = true;
  std::shared_ptr<VesselChangeObserver> waiting;

 private:
  VesselItems items_;
};

class ScriptedFeed : public ::testing::Test {
 protected:
  Result<void> catchUp(std::stop_token stop = {}) { return feeder.catchUp(set, std::move(stop)); }
  Names all() {
    Names names = items.names(index->search({.words = {"txt"}}));
    std::ranges::sort(names);
    return names;
  }

  TempHome home;
  SearchItems items;
  ScriptedSet set{items.items({"1.txt", "2.txt", "3.txt"})};
  std::unique_ptr<SearchIndex> index = SearchIndex::open(home.path()).value();
  SearchFeeder feeder{*index};
};

TEST_F(ScriptedFeed, TheAnchorIsTakenBeforeTheListingWhichBeginsAgainWhenAPageExpired) {
  set.pageErrors = {Error::syncAnchorExpired()};
  ASSERT_TRUE(catchUp());
  EXPECT_THAT(set.calls,
              ElementsAre("anchor", "first", "next", "anchor", "first", "next", "since a"));
  EXPECT_THAT(all(), SizeIs(3));
  ASSERT_TRUE(catchUp());
  EXPECT_EQ(set.calls.back(), "since c");
}

TEST_F(ScriptedFeed, WhatFailsLeavesWhatWasThere) {
  ASSERT_TRUE(catchUp());
  const struct {
    const char* what;
    std::function<void()> arrange;
    Error error;
  } cases[] = {
      {"changes", [&] { set.changeError = Error::posix(EIO); }, Error::posix(EIO)},
      {"a listing after that",
       [&] {
         set.changeError = Error::syncAnchorExpired();
         set.pageErrors = {Error::posix(EMFILE)};
       },
       Error::posix(EMFILE)},
      {"the anchor", [&] { set.hasAnchor = false; },
       Error::local(LocalVesselError::unableToGetDeviceUUID)},
  };
  for (const auto& each : cases) {
    each.arrange();
    EXPECT_EQ(catchUp().error(), each.error) << each.what;
    EXPECT_EQ(index->anchor(), anchorOf("c")) << each.what;
    EXPECT_THAT(all(), SizeIs(3)) << each.what;
  }
}

TEST_F(ScriptedFeed, ListingsThatKeepExpiringEndWithTheError) {
  set.pageErrors = std::vector<Error>(1000, Error::syncAnchorExpired());
  EXPECT_EQ(catchUp().error(), Error::syncAnchorExpired());
  EXPECT_GT(set.pageErrors.size(), 900u);
  EXPECT_EQ(index->anchor(), std::nullopt);
}

// As an upgrade of the app libraries does in the midst of a listing, which waits for the answer.
TEST_F(ScriptedFeed, DomainsCanBeDeletedWhileAPageIsListed) {
  set.whilePage = [&] { EXPECT_TRUE(index->deleteDomains({"org.example.Draw"})); };
  ASSERT_TRUE(catchUp());
  EXPECT_THAT(all(), SizeIs(3));
}

TEST_F(ScriptedFeed, ItStopsWhenItIsAskedTo) {
  std::stop_source source;
  set.whilePage = [&] { source.request_stop(); };
  EXPECT_TRUE(catchUp(source.get_token()).error().isPosix(ECANCELED));
  EXPECT_EQ(index->anchor(), std::nullopt);
  set.whilePage = {};
  ASSERT_TRUE(catchUp());
  set.answers = false;
  std::stop_source second;
  std::thread stopping([&] { second.request_stop(); });
  EXPECT_TRUE(catchUp(second.get_token()).error().isPosix(ECANCELED));
  stopping.join();
  EXPECT_EQ(index->anchor(), anchorOf("c"));
  // Who was asked may answer when nobody waits any more.
  set.waiting->didUpdateItems({});
  set.waiting->finishEnumeratingChangesUpToSyncAnchor(anchorOf("late"), false);
  EXPECT_EQ(index->anchor(), anchorOf("c"));
}

TEST_F(SearchFeederTest, WhoSearchesWaitsNoLongerThanItIsToRun) {
  home.writeFile("letter.txt");
  Searching searching(*provider);
  searching.stop();
  const auto found = searching.search({.words = {"letter"}});
  ASSERT_FALSE(found);
  EXPECT_TRUE(found.error().isPosix(ECANCELED)) << found.error().description();
}

}  // namespace
}  // namespace mirabel::testing
