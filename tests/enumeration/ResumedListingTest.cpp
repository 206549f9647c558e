#include <algorithm>
#include <cerrno>
#include <set>

#include "enumeration/EnumerationFixture.h"
#include "enumeration/LocalFileEnumerator.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

const Error expired = Error::syncAnchorExpired();

/// Listings whose pages are asked for in different processes.
class ResumedListing : public EnumerationTest {
 protected:
  void fillTree() {
    addFiles("a/", 90);
    addFiles("b/c/d/", 250);
    addFiles("b/c/p.bundle/", 3);
    addFiles("e/", 130);
    addFiles(".Trash/", 150);
  }
  std::vector<std::string> listAll(bool inOneProcess) {
    const auto listing = enumerator(workingSet);
    std::vector<std::string> names;
    std::optional<Data> page = firstPage();
    while (page) {
      if (!inOneProcess) forgetWalks();
      ListedPage listed = list(*listing, *page);
      EXPECT_FALSE(listed.error);
      names.insert(names.end(), listed.names.begin(), listed.names.end());
      page = listed.next;
    }
    return names;
  }
  void emptyTheStorage() {
    fake.volume.remove(fake.path(""));
    fake.volume.makeFolder(fake.path(""));
    forgetListings();
  }
  Data& keptPosition() { return fake.positions.kept.rbegin()->second; }
};

TEST_F(ResumedListing, OfAWholeTreeIsTheSameAsInOneGo) {
  fillTree();
  const auto whole = listAll(true);
  EXPECT_EQ(whole.size(), 6 + 90 + 250 + 130 + 150U);
  EXPECT_EQ(listAll(false), whole);
}

TEST_F(ResumedListing, ReadsNothingAgain) {
  fillTree();
  const auto listing = enumerator(workingSet);
  const ListedPage first = list(*listing);
  const WalkPosition at = WalkPosition::decode(keptPosition()).value();
  ASSERT_EQ(at.folders.size(), 4U);
  EXPECT_EQ(at.folders.front().name, fake.path(""));
  EXPECT_EQ(at.folders.back().name, "d");
  forgetWalks();
  fake.faults.reset();
  const ListedPage second = list(*listing, *first.next);
  EXPECT_EQ(second.names.size(), 200U);
  EXPECT_EQ(fake.faults.calls(Op::openDirectory), 5U);  // and "e"
  EXPECT_LT(fake.faults.calls(Op::nextEntry), 210U);
}

TEST_F(ResumedListing, StartsOverWhereSomethingLiesElsewhere) {
  const auto resumedAfter = [&](const std::function<void()>& change) {
    std::optional<Error> errors[2];
    for (const bool inOneProcess : {true, false}) {
      fillTree();
      const auto listing = enumerator(workingSet);
      const ListedPage first = list(*listing);
      change();
      if (!inOneProcess) forgetWalks();
      errors[inOneProcess ? 0 : 1] = list(*listing, *first.next).error;
      emptyTheStorage();
    }
    EXPECT_EQ(errors[0], errors[1]);
    return errors[0];
  };
  EXPECT_FALSE(resumedAfter([] {}));
  EXPECT_FALSE(resumedAfter([&] { rename("b/c/d/0", "e/new"); }));
  // With and without an event that tells of it.
  EXPECT_EQ(resumedAfter([&] { rename("b/c", "b/x"); }), expired);
  EXPECT_EQ(resumedAfter([&] { fake.volume.rename(fake.path("b"), fake.path("x")); }), expired);
  EXPECT_EQ(resumedAfter([&] {
              fake.volume.rename(fake.path("b/c/d"), fake.path("d"));
              fake.volume.makeFolder(fake.path("b/c/d"));
            }),
            expired);
  EXPECT_EQ(resumedAfter([&] { rename("e", "b/e"); }), expired);
  EXPECT_EQ(resumedAfter([&] {
              const std::uint64_t fileID = fake.volume.at(fake.path("a/1")).fileID;
              fake.volume.remove(fake.path("a/1"));
              events.append(fake.path("a/1"), fileID);
            }),
            expired);
}

/// Two listings of one folder that come to different places while it changes between their pages.
TEST_F(ResumedListing, IsNotMixedUpWithAnother) {
  const std::pair<const char*, std::function<void()>> cases[] = {
      {"a name leaves", [&] { rename("005", "away/005"); }},
      {"a name comes",
       [&] {
         addFile("0000");
         for (const char* changed : {"0000", ""})
           events.append(fake.path(changed), fake.volume.at(fake.path(changed)).fileID);
       }},
  };
  for (const auto& [what, change] : cases) {
    for (const bool inOneProcess : {true, false}) {
      SCOPED_TRACE(what);
      for (int i = 0; i < 650; ++i)
        addFile(std::to_string(1000 + i).substr(1));
      fake.volume.makeFolder(fake.path("away"));
      const auto listing = enumerator();
      const auto go = [&](const Data& page, std::set<std::string>& names) {
        if (!inOneProcess) forgetWalks();
        const ListedPage listed = list(*listing, page);
        EXPECT_FALSE(listed.error);
        names.insert(listed.names.begin(), listed.names.end());
        return listed.next;
      };
      std::set<std::string> first;
      std::set<std::string> second;
      auto firstPlace = go(firstPage(), first);
      change();
      firstPlace = go(*firstPlace, first);
      auto secondPlace = go(firstPage(), second);
      secondPlace = go(*secondPlace, second);
      EXPECT_NE(firstPlace, secondPlace);
      while (firstPlace || secondPlace) {
        if (firstPlace) firstPlace = go(*firstPlace, first);
        if (secondPlace) secondPlace = go(*secondPlace, second);
      }
      for (int i = 6; i < 650; ++i) {
        const std::string name = std::to_string(1000 + i).substr(1);
        EXPECT_TRUE(first.contains(name) && second.contains(name)) << name;
      }
      emptyTheStorage();
    }
  }
}

/// Counting from the start would lead past a neighbour, also some pages later.
TEST_F(ResumedListing, WithoutItsPositionStartsOverOnceANameHasLeft) {
  const auto resumedAfter = [&](const std::function<void()>& change) {
    std::optional<Error> errors[2];
    for (const bool isRightAfter : {true, false}) {
      addFiles("", 650);
      addFile("Inbox/1");
      const auto listing = enumerator();
      ListedPage page = list(*listing);
      change();
      if (!isRightAfter) page = list(*listing, *page.next);
      EXPECT_FALSE(page.error);
      forgetListings();
      errors[isRightAfter ? 0 : 1] = list(*listing, *page.next).error;
      emptyTheStorage();
    }
    EXPECT_EQ(errors[0], errors[1]);
    return errors[0];
  };
  const auto happens = [&](std::string_view name, std::uint32_t flags = 0) {
    events.append({0, flags, fake.path(name), fake.volume.at(fake.path(name)).fileID, {}});
  };
  EXPECT_EQ(resumedAfter([&] { rename("5", "Inbox/5"); }), expired);
  EXPECT_EQ(resumedAfter([&] { happens("Inbox"); }), expired);
  EXPECT_EQ(resumedAfter([&] { happens("5", eventflag::changedObject); }), expired);
}

TEST_F(ResumedListing, OfOtherFoldersStartsOver) {
  fillTree();
  const ListedPage first = list(*enumerator(workingSet));
  fake.install("org.example.draw", "/apps/draw", "Draw");
  forgetWalks();
  const auto listing = LocalFileEnumerator::create(
      services, workingSet, {fake.url(), URL::fileURL("/apps/draw/Documents")});
  EXPECT_EQ(list(*listing, *first.next).error, expired);
}

TEST_F(ResumedListing, GoesOnByItsOffsetWithoutAUsablePosition) {
  fillTree();
  const auto listing = enumerator(workingSet);
  const ListedPage first = list(*listing);
  const auto expected = list(*listing, *first.next).names;
  ASSERT_EQ(expected.size(), 200U);
  const Data good = fake.positions.find(workingSet, *first.next).value();
  for (std::size_t size = 0; size < good.size(); ++size) {
    fake.positions.kept[{workingSet, *first.next}] = Data(good.begin(), good.begin() + size);
    forgetWalks();
    EXPECT_EQ(list(*listing, *first.next).names, expected) << size;
  }
  fake.faults.fail(Op::keepPosition, Error::posix(ENOSPC), 1, 10);
  fake.positions.kept.clear();
  EXPECT_EQ(listAll(false).size(), 6 + 90 + 250 + 130 + 150U);
}

TEST_F(ResumedListing, OfPositionsThatLeadNowhereNeverLeavesTheTree) {
  fillTree();
  addFile("outside");
  fake.volume.makeFolder("/home/me/Private");
  const auto listing = enumerator(workingSet);
  const ListedPage first = list(*listing);
  const WalkPosition good = WalkPosition::decode(keptPosition()).value();
  const std::function<void(WalkPosition&)> distortions[] = {
      [](WalkPosition& at) { at.plan ^= 1; },
      [](WalkPosition& at) { at.nextRoot = 0; },
      [](WalkPosition& at) { at.nextRoot = 3; },
      [](WalkPosition& at) { at.folders.erase(at.folders.begin()); },
      [](WalkPosition& at) { at.folders[0].name = "/home/me"; },
      [](WalkPosition& at) { at.folders[1].name = "../Private"; },
      [](WalkPosition& at) { at.folders[1].name = ".."; },
      [](WalkPosition& at) { at.folders[2].fileID += 1; },
      [](WalkPosition& at) { at.descent = ".."; },
      [](WalkPosition& at) { at.descent = ""; },
      [](WalkPosition& at) {
        at.folders.clear();
        at.descent = "a";
      },
  };
  for (const auto& distort : distortions) {
    WalkPosition at = good;
    distort(at);
    fake.positions.kept[{workingSet, *first.next}] = at.encode();
    forgetWalks();
    EXPECT_EQ(list(*listing, *first.next).error, expired);
  }
}

TEST_F(ResumedListing, ThatCannotOpenItsFoldersSaysWhy) {
  fillTree();
  const auto listing = enumerator(workingSet);
  const ListedPage first = list(*listing);
  forgetWalks();
  fake.faults.fail(Op::openDirectory, Error::posix(EMFILE), 2);
  EXPECT_EQ(list(*listing, *first.next).error, Error::posix(EMFILE));
  fake.faults.reset();
  EXPECT_EQ(list(*listing, *first.next).names.size(), 200U);
}

}  // namespace
}  // namespace mirabel::testing
