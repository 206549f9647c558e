#include <cerrno>

#include "enumeration/EnumerationFixture.h"
#include "enumeration/LocalRootEnumerator.h"
#include "fs/RunningReaders.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class LocalRootEnumeratorTest : public EnumerationTest {
 protected:
  static inline const std::string root{VesselRootContainerItemIdentifier};

  void install(const std::string& identifier) {
    fake.install(identifier, "/apps/" + identifier, identifier + "'s");
  }
  /// What the provider does when the registry has told that something changed.
  void refresh() {
    appLibraries.refreshFromRegistry();
    appLibraries.upgradeFromMainCache();
    appLibraries.followLibraries(events);
  }
  std::shared_ptr<LocalRootEnumerator> enumerator(const std::string& container) {
    return LocalRootEnumerator::create(rootServices, appLibraries, container, LiveUpdates::unwanted,
                                       readers);
  }
  ListedPage listPage(VesselEnumerator& enumerating, const Data& page = firstPage()) {
    PageObserver observer;
    enumerating.enumerateItems(observer, page);
    return observer.page;
  }
  Data anchor(std::uint64_t version, std::uint64_t event = 0) const {
    return FSChangeToken{0, fake.historyUUID, event, 0, version}.encode();
  }
  static FSChangeToken anchorOf(VesselEnumerator& enumerating) {
    std::optional<FSChangeToken> token;
    enumerating.currentSyncAnchor(
        [&](const std::optional<Data>& data) { token = FSChangeToken::decode(data.value()); });
    return token.value();
  }
  /// What the observer is told before the files are, and the token with which these go on.
  struct Bridged {
    std::vector<std::string> calls;
    std::optional<FSChangeToken> next;
    std::vector<URL> urls;
  };
  Bridged changes(VesselEnumerator& enumerating, const Data& from) {
    log.clear();
    const auto observer = std::make_shared<ChangeLog>();
    const std::size_t before = made.made.size();
    enumerating.enumerateChanges(observer, from);
    Bridged bridged{observer->calls, {}, {}};
    if (made.made.size() > before) {
      const auto enumeration = made.made.back().lock();
      bridged.next = enumeration->token;
      bridged.urls = enumeration->urls;
      // Until it finishes it is held by who started it.
      enumeration->observer->finishEnumeratingChangesUpToSyncAnchor(from, false);
    }
    return bridged;
  }
  std::vector<std::string> messages() const {
    std::vector<std::string> texts;
    for (const LogLine& line : log.messages())
      texts.push_back(line.text);
    return texts;
  }

  MRBAppLibraryManager appLibraries{fake.platform()};
  FakeChangesEnumerations made;
  FileObjectURLs rootIdentity{fake.platform(), appLibraries};
  EnumerationServices rootServices{
      {fake.platform(), rootIdentity, appLibraries}, {events, fake.diagnostics, made}, walks};
  RunningReaders readers;
};

TEST_F(LocalRootEnumeratorTest, ListsAppLibrariesBeforeFiles) {
  install("draw");
  install("write");
  addFile("a.txt");
  fake.volume.makeFolder("/apps/draw/Documents/pictures");
  refresh();
  log.clear();
  EXPECT_THAT(listPage(*enumerator(root)).names, ElementsAre("draw's", "write's", "a.txt"));
  EXPECT_THAT(log.sectionLabels(), Contains("enumerate root items for " + root));
  EXPECT_THAT(listPage(*enumerator(workingSet)).names,
              ElementsAre("draw's", "write's", "a.txt", "pictures"));
  EXPECT_THAT(listPage(*enumerator(allDirectories)).names, ElementsAre("pictures"))
      << "they are no folders among others";
}

TEST_F(LocalRootEnumeratorTest, AnAnchorOfAnotherVersionIsRefused) {
  install("draw");
  refresh();
  install("write");
  refresh();
  struct Case {
    std::string container;
    std::uint64_t version;
    std::string message;
  };
  const std::string greater =
      "[INFO] app-library version is greater than local version, need to restart from scratch ";
  const std::string nothing =
      "[ERROR] change token version matches nothing, need to restart from scratch ";
  const Case cases[] = {
      {root, 3, greater + "[changeTokenVersion: 3, localVersion: 2, mainCacheVersion: 2]"},
      {root, 1, nothing + "[changeTokenVersion: 1, localVersion: 2, mainCacheVersion: 2]"},
      {workingSet, 3,
       greater + "[changeTokenVersion: 3, localVersion: 2, workingSetVersion: 2, "
                 "mainCacheVersion: 2]"},
      {workingSet, 1,
       nothing + "[changeTokenVersion: 1, localVersion: 2, workingSetVersion: 2, "
                 "mainCacheVersion: 2]"},
  };
  for (const Case& c : cases) {
    const auto enumerating = enumerator(c.container);
    static_cast<void>(anchorOf(*enumerating));
    EXPECT_THAT(changes(*enumerating, anchor(c.version)).calls, ElementsAre("error -1002"));
    EXPECT_THAT(messages(), Contains(c.message));
  }
  const auto all = enumerator(allDirectories);
  EXPECT_THAT(changes(*all, anchor(3)).calls, IsEmpty()) << "of which no version is told";
  EXPECT_THAT(changes(*enumerator(root), dataFromString("none")).calls, ElementsAre("error -1002"));
  EXPECT_THAT(messages(),
              Contains("[ERROR] can't create change token from anchor data, resetting"));
}

TEST_F(LocalRootEnumeratorTest, WhatCameAndWentSinceTheAnchorIsToldAndWithoutAVersionEverything) {
  for (const std::string& container : {root, workingSet}) {
    fake.applications.installed.clear();
    install("draw");
    install("sing");
    refresh();
    const auto enumerating = enumerator(container);
    const FSChangeToken start = anchorOf(*enumerating);
    const Bridged everything = changes(*enumerating, anchor(0));
    EXPECT_THAT(everything.calls, ElementsAre("update draw's sing's"));
    EXPECT_EQ(everything.next.value().appLibraryVersionToken, start.appLibraryVersionToken);
    EXPECT_THAT(messages(), Contains("[DEBUG] change token version is zero, let's send all the "
                                     "app-libraries known"));
    fake.uninstall("sing");
    install("write");
    refresh();
    const Bridged bridged = changes(*enumerating, start.encode());
    EXPECT_THAT(bridged.calls, ElementsAre("update draw's write's", "delete #sing"));
    EXPECT_THAT(messages(), Contains("[DEBUG] change token version matches local version"));
    EXPECT_THAT(messages(), Contains(HasSubstr("[DEBUG] updated root enumerator to monitor ")));
    ASSERT_TRUE(bridged.next);
    EXPECT_EQ(bridged.next->appLibraryVersionToken, start.appLibraryVersionToken + 1);
    EXPECT_THAT(bridged.urls, ElementsAre(fake.url(), URL::fileURL("/apps/draw/Documents"),
                                          URL::fileURL("/apps/write/Documents")));
    EXPECT_THAT(changes(*enumerating, bridged.next->encode()).calls, IsEmpty());
  }
}

// An anchor may have been taken behind the events that told of what lies in a library, by an
// enumerator that did not show it yet.
TEST_F(LocalRootEnumeratorTest, EventsAreReadAgainFromWhereTheAnchorsVersionEnded) {
  install("draw");
  refresh();
  events.append("/home/me/Documents/a");
  install("write");
  refresh();
  for (int i = 0; i < 3; ++i)
    events.append("/apps/write/Documents/b");
  const auto all = enumerator(allDirectories);
  EXPECT_EQ(changes(*all, anchor(1, 4)).next.value().streamEventID, 1U);
  EXPECT_EQ(changes(*all, anchor(2, 4)).next.value().streamEventID, 4U);
  EXPECT_EQ(changes(*all, anchor(1, 0)).next.value().streamEventID, 0U) << "it is before anyway";
}

TEST_F(LocalRootEnumeratorTest, TheWorkingSetGoesOnFromTheVersionThatWasToldLast) {
  install("draw");
  refresh();
  const FSChangeToken first = anchorOf(*enumerator(workingSet));
  EXPECT_EQ(first.appLibraryVersionToken, 1U);
  install("write");
  refresh();
  // As in another process.
  const auto later = enumerator(workingSet);
  EXPECT_THAT(changes(*later, first.encode()).calls, ElementsAre("update draw's write's"));
  EXPECT_EQ(enumerator(workingSet)->appLibraryManager().versionToken(), 2U);
  // Where it can't be kept, the next one starts over.
  install("sing");
  refresh();
  fake.faults.fail(Op::cacheReplace, Error::posix(ENOSPC));
  EXPECT_THAT(changes(*later, anchor(2)).calls, ElementsAre("update draw's write's sing's"));
  EXPECT_THAT(messages(), Contains(HasSubstr("[ERROR] can't save working-set cache to disk; ")));
  EXPECT_THAT(changes(*enumerator(workingSet), anchor(3)).calls, ElementsAre("error -1002"));
}

TEST_F(LocalRootEnumeratorTest, APageGoesOnUnderTheSameLibrariesOnly) {
  install("draw");
  addFiles("a", 201);
  refresh();
  const auto enumerating = enumerator(workingSet);
  const ListedPage page = listPage(*enumerating);
  EXPECT_EQ(FSChangeToken::decode(page.next.value()).value().appLibraryVersionToken, 1U);
  EXPECT_THAT(listPage(*enumerating, *page.next).names.size(), 1U);
  forgetListings();
  EXPECT_THAT(listPage(*enumerator(workingSet), *page.next).names.size(), 1U);
  install("write");
  refresh();
  static_cast<void>(anchorOf(*enumerating));
  EXPECT_EQ(listPage(*enumerating, *page.next).error, Error::syncAnchorExpired());
}

}  // namespace
}  // namespace mirabel::testing
