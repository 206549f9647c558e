#include <algorithm>
#include <cerrno>

#include "applibrary/AppLibraryFixture.h"
#include "applibrary/AppLibraryRefresh.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;

class AppLibraryRefreshTest : public AppLibraryFixture {
 protected:
  bool refresh() { return refreshMainCache(fake.applications, caches.main).value_or(false); }
  std::vector<std::string> retrieved() {
    std::vector<std::string> identifiers;
    const auto records = retrieveAppLibraries(fake.applications);
    for (const BundleProxy& record : *records)
      identifiers.push_back(record.bundleIdentifier.value_or("-"));
    return identifiers;
  }

  AppLibraryCaches caches{fake.caches};
};

TEST_F(AppLibraryRefreshTest, OnlyApplicationsThatShowTheirDocumentsQualify) {
  struct Case {
    std::string identifier;
    std::optional<PropertyList> browser;
    bool opensInPlace;
    bool sharesFiles;
    bool qualifies;
  };
  const Case cases[] = {
      {"browser", PropertyList(true), false, false, true},
      {"neither", {}, false, false, false},
      {"opens", {}, true, false, false},
      {"shares", {}, false, true, false},
      {"both", {}, true, true, true},
      {"both.no.browser", PropertyList(false), true, true, true},
      {"text", PropertyList(std::string("true")), false, true, false},
  };
  std::vector<std::string> expected;
  for (const auto& [identifier, browser, opensInPlace, sharesFiles, qualifies] : cases) {
    BundleProxy record = recordOf(identifier, "/apps/" + identifier);
    record.supportsOpenInPlace = opensInPlace;
    record.fileSharingEnabled = sharesFiles;
    fake.applications.installed.push_back(record);
    if (browser) {
      fake.applications.infoDictionaries[identifier] = {{"UISupportsDocumentBrowser", *browser}};
    }
    if (qualifies) expected.push_back(identifier);
  }
  EXPECT_THAT(retrieved(), ElementsAreArray(expected));
  EXPECT_THAT(log.sectionLabels(), ElementsAre("retrieving app libraries from kestrel"));
  EXPECT_THAT(messages(), ElementsAre("[DEBUG] add browser", "[DEBUG] add both",
                                      "[DEBUG] add both.no.browser"));
}

TEST_F(AppLibraryRefreshTest, EntriesThatLackSomethingAreSkipped) {
  for (const char* identifier : {"a", "b", "c", "d", "e"})
    install(identifier);
  auto& installed = fake.applications.installed;
  installed[0].dataContainerURL.reset();
  installed[1].dataContainerURL = URL::fromString("https://example.org/b");
  fake.applications.withoutInfoDictionary = {"c"};
  installed[3].bundleIdentifier.reset();
  fake.applications.unreadable = 2;
  fake.applications.ofSystem = {installed[4]};
  installed.pop_back();
  EXPECT_THAT(retrieved(), ElementsAre("-", "e"));
  const std::string missing = "[ERROR] enumerate Application provided nil proxy";
  EXPECT_THAT(messages(), ElementsAre(missing, missing, "[DEBUG] add <unknown>", "[DEBUG] add e"));
  // Nothing is asked of an application that has no container.
  EXPECT_EQ(fake.faults.calls(Op::infoDictionary), 3U);
}

TEST_F(AppLibraryRefreshTest, EveryDifferenceOfTheContainersIsAChange) {
  install("a");
  install("b");
  auto& installed = fake.applications.installed;
  ASSERT_TRUE(refresh());
  std::swap(installed[0], installed[1]);
  EXPECT_TRUE(refresh());
  installed[0].dataContainerURL = URL::fileURL("/apps/moved");
  EXPECT_TRUE(refresh());
  fake.uninstall("a");
  EXPECT_TRUE(refresh());
  installed.clear();
  EXPECT_TRUE(refresh());
  EXPECT_FALSE(refresh());
  EXPECT_EQ(caches.main.versionToken(), 5U);
}

TEST_F(AppLibraryRefreshTest, LostOrOlderFileIsReplacedEvenByAnEqualList) {
  install("a");
  ASSERT_TRUE(refresh());
  const auto former = fake.caches.files;
  fake.applications.installed.clear();
  ASSERT_TRUE(refresh());
  // What managers hold stands for token 2; an empty list is no proof that they have it.
  fake.caches.files.clear();
  EXPECT_TRUE(refresh());
  EXPECT_EQ(caches.main.versionToken(), 3U);
  EXPECT_FALSE(refresh());

  install("a");
  fake.caches.files = former;
  EXPECT_TRUE(refresh());
  EXPECT_EQ(caches.main.versionToken(), 4U);
  EXPECT_EQ(caches.main.load()->records.size(), 1U);
}

TEST_F(AppLibraryRefreshTest, FailureOfAnyCallLeavesTheCacheAndIsMadeGoodLater) {
  install("a");
  install("b");
  ASSERT_TRUE(refresh());
  const Data before = fake.caches.files.at(mainCachePath);
  install("c");
  for (const Op op :
       {Op::enumerateApplications, Op::claimVersion, Op::cacheFolder, Op::cacheReplace}) {
    fake.faults.fail(op, Error::posix(EIO));
    EXPECT_FALSE(refresh());
    EXPECT_EQ(log.messages().back(),
              (LogLine{LogLevel::error,
                       "[ERROR] can't refresh app libraries; " + Error::posix(EIO).description()}));
    EXPECT_EQ(fake.caches.files.at(mainCachePath), before);
    EXPECT_EQ(caches.main.versionToken(), 1U);
  }
  // The second enumeration, that of the system's applications, counts as well.
  fake.faults.fail(Op::enumerateApplications, Error::posix(EIO), 2);
  EXPECT_FALSE(refresh());
  EXPECT_TRUE(refresh());
  EXPECT_EQ(caches.main.load()->records.size(), 3U);
}

}  // namespace
}  // namespace mirabel::testing
