#include <cerrno>
#include <set>

#include "enumeration/EnumerationFixture.h"
#include "enumeration/LocalFileEnumerator.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

const Error startOver = Error::syncAnchorExpired();

class LocalFileEnumeratorTest : public EnumerationTest {
 protected:
  std::string folderID(std::string_view name) {
    return "fid=" + std::to_string(fake.volume.at(fake.path(name)).fileID);
  }
};

TEST_F(LocalFileEnumeratorTest, PagesOfTwoHundredEndWithAPageThatIsNotFull) {
  struct Case {
    int children;
    std::vector<std::size_t> pages;
  };
  const Case cases[] = {{0, {0}}, {1, {1}}, {199, {199}}, {200, {200, 0}}, {201, {200, 1}}};
  for (const Case& c : cases) {
    for (const char* kept : {"walk", "position", "offset"}) {
      const std::string name = std::to_string(c.children) + kept;
      fake.volume.makeFolder(fake.path(name));
      addFiles(name + "/", c.children);
      const auto listing = LocalFileEnumerator::create(services, folderID(name), {fake.url(name)});
      std::vector<std::size_t> sizes;
      std::set<std::string> names;
      std::optional<Data> page = firstPage();
      while (page && sizes.size() < 5) {
        if (name.ends_with("position")) forgetWalks();
        if (name.ends_with("offset")) forgetListings();
        const ListedPage listed = list(*listing, *page);
        ASSERT_FALSE(listed.error) << listed.error->description();
        sizes.push_back(listed.names.size());
        names.insert(listed.names.begin(), listed.names.end());
        page = listed.next;
      }
      EXPECT_EQ(sizes, c.pages);
      EXPECT_EQ(names.size(), static_cast<std::size_t>(c.children));
    }
  }
}

TEST_F(LocalFileEnumeratorTest, CursorHoldsTheHistoryTheEventThatWasReachedAndTheOffset) {
  addFiles("", 401);
  const auto listing = enumerator();
  Data page = firstPage();
  for (const std::uint64_t number : {1U, 2U}) {
    events.append(fake.path("0"), fake.volume.at(fake.path("0")).fileID);
    page = list(*listing, page).next.value();
    EXPECT_EQ(FSChangeToken::decode(page),
              (FSChangeToken{0, fake.historyUUID, number, number * 200, 0}));
  }
}

TEST_F(LocalFileEnumeratorTest, UnusableCursorStartsTheListingOver) {
  addFiles("", 201);
  const auto listing = enumerator();
  const FSChangeToken good = FSChangeToken::decode(list(*listing).next.value()).value();
  FSChangeToken other = good;
  other.deviceUUID = UUID{};
  FSChangeToken far = good;
  far.offset = 500;
  FSChangeToken future = good;
  future.streamEventID = 99;
  for (const Data& page :
       {dataFromString("junk"), Data{}, other.encode(), far.encode(), future.encode()}) {
    const ListedPage listed = list(*listing, page);
    EXPECT_EQ(listed.error, startOver);
    EXPECT_THAT(listed.names, IsEmpty());
  }
  fake.faults.fail(Op::historyUUID, Error::posix(EIO));
  EXPECT_EQ(list(*listing).error, Error::local(LocalVesselError::unableToGetDeviceUUID));
}

TEST_F(LocalFileEnumeratorTest, MovesBetweenPagesThatAreCountedSkipNoNeighbour) {
  fake.volume.makeFolder(fake.path("elsewhere"));
  addFiles("folder/", 400);
  const auto listing =
      LocalFileEnumerator::create(services, folderID("folder"), {fake.url("folder")});
  // Counted from the start, the 200th entry is another one by now.
  ListedPage first = list(*listing);
  rename("folder/3", "elsewhere/3");
  forgetListings();
  EXPECT_EQ(list(*listing, *first.next).error, startOver);
  // What changes in its place lets all go on.
  first = list(*listing);
  events.append(fake.path("folder/2"), fake.volume.at(fake.path("folder/2")).fileID);
  forgetListings();
  const ListedPage second = list(*listing, *first.next);
  ASSERT_FALSE(second.error);
  EXPECT_EQ(second.names.front(), "201");
}

TEST_F(LocalFileEnumeratorTest, WhatIsNotShownMakesNoItems) {
  for (const char* file : {"a", ".hidden/h", "Inbox/i", "sub/Inbox/i", "p.bundle/in", "sub/s",
                           ".Trash/t/deep", ".Trash/u", ".Trash/.v", "sub/.Trash/w"}) {
    addFile(file);
  }
  EXPECT_THAT(list(*enumerator()).names, ElementsAre("a", "sub", "p.bundle"));
  EXPECT_THAT(list(*enumerator(workingSet)).names,
              ElementsAre("a", "sub", "s", "p.bundle", "t", "u"));
  EXPECT_THAT(list(*enumerator(allDirectories)).names, ElementsAre("sub"));
  const auto trash =
      LocalFileEnumerator::create(services, folderID(".Trash"), {fake.url(".Trash")});
  EXPECT_THAT(list(*trash).names, ElementsAre("t", "u"));
}

TEST_F(LocalFileEnumeratorTest, WorkingSetListsTheTrashAfterAllRoots) {
  fake.install("org.example.draw", "/apps/draw", "Draw");
  fake.volume.writeFile("/apps/draw/Documents/drawn");
  fake.volume.makeFolder("/apps/draw/Documents/.Trash");
  fake.volume.writeFile("/apps/draw/Documents/.Trash/erased");
  addFile("written");
  addFile(".Trash/torn");
  const auto listing = LocalFileEnumerator::create(
      services, workingSet, {fake.url(), URL::fileURL("/apps/draw/Documents")});
  EXPECT_THAT(list(*listing).names, ElementsAre("written", "drawn", "torn", "erased"));
  EXPECT_EQ(fake.faults.calls(Op::permanentStorageForItemAtURL), 4U);
}

TEST_F(LocalFileEnumeratorTest, FilesCountTowardsTheOffsetOfAllDirectories) {
  addFiles("a/", 250);
  addFile("b/file");
  const auto listing = enumerator(allDirectories);
  const ListedPage first = list(*listing);
  EXPECT_THAT(first.names, ElementsAre("a"));
  EXPECT_EQ(FSChangeToken::decode(first.next.value())->offset, 200U);
  EXPECT_THAT(list(*listing, *first.next).names, ElementsAre("b"));
  EXPECT_EQ(fake.faults.calls(Op::permanentStorage), 0U);
}

TEST_F(LocalFileEnumeratorTest, FolderThatCannotBeReadIsAnErrorOnlyAsTheContainerItself) {
  addFile("a/1");
  addFile("b");
  for (const int code : {EACCES, ENOENT, EXDEV}) {
    fake.faults.reset();
    fake.faults.fail(Op::openDirectory, Error::posix(code), 2);
    EXPECT_THAT(list(*enumerator(workingSet)).names, ElementsAre("a", "b")) << code;
    fake.faults.reset();
    fake.faults.fail(Op::openDirectory, Error::posix(code));
    EXPECT_THAT(list(*enumerator(allDirectories)).names, IsEmpty()) << code;
    fake.faults.reset();
    fake.faults.fail(Op::openDirectory, Error::posix(code));
    EXPECT_EQ(list(*enumerator()).error, Error::posix(code));
  }
  for (const Op op : {Op::openDirectory, Op::closeDirectory, Op::prefetch}) {
    fake.faults.reset();
    fake.faults.fail(op, Error::posix(EMFILE));
    EXPECT_EQ(list(*enumerator(workingSet)).error, Error::posix(EMFILE));
  }
}

TEST_F(LocalFileEnumeratorTest, NothingThatIsThereIsLeftOutForAFailure) {
  addFiles("folder/", 3);
  const std::set<std::string> expected{"folder", "0", "1", "2"};
  for (int number = 0; number <= static_cast<int>(Op::historyUUID); ++number) {
    const Op op = static_cast<Op>(number);
    if (op == Op::nextEntry) continue;  // a stream that cannot be read any further has ended
    for (std::size_t n = 1;; ++n) {
      const auto listing = enumerator(workingSet);
      fake.faults.reset();
      fake.faults.fail(op, Error::posix(EMFILE), n);
      const ListedPage page = list(*listing);
      if (fake.faults.calls(op) < n) break;
      if (page.error) continue;
      EXPECT_EQ(std::set(page.names.begin(), page.names.end()), expected) << number << " " << n;
    }
  }
}

TEST_F(LocalFileEnumeratorTest, EntriesOfAPageAreLookedAtInOneGo) {
  addFiles("", 200);
  const auto listing = enumerator();
  fake.faults.reset();
  EXPECT_THAT(list(*listing).names, SizeIs(200));
  EXPECT_EQ(fake.faults.calls(Op::prefetch), 1U);
  EXPECT_EQ(fake.faults.calls(Op::readValues), 1U);  // the folder
}

TEST_F(LocalFileEnumeratorTest, EachPageCostsAPage) {
  addFiles("", 1000);
  const auto listing = enumerator();
  std::optional<Data> page = firstPage();
  fake.faults.reset();
  while (page)
    page = list(*listing, *page).next;
  EXPECT_EQ(fake.faults.calls(Op::openDirectory), 1U);
  EXPECT_EQ(fake.faults.calls(Op::nextEntry), 1003U);
}

TEST_F(LocalFileEnumeratorTest, EnumeratorWithoutANotifierStillLists) {
  addFile("a");
  EXPECT_EQ(enumerator(workingSet)->notifier(), nullptr);
  EXPECT_NE(enumerator(allDirectories)->notifier(), nullptr);
  fake.faults.fail(Op::historyUUID, Error::posix(EIO));
  const auto listing = enumerator();
  EXPECT_EQ(listing->notifier(), nullptr);
  listing->startNotifier();
  EXPECT_THAT(list(*listing).names, ElementsAre("a"));
  EXPECT_DEATH(
      {
        Log::shared().setSink(nullptr, LogLevel::error);
        static_cast<void>(LocalFileEnumerator::create(services, "fid=1", {}));
      },
      "can't create enumerator for an empty list of URLs");
}

}  // namespace
}  // namespace mirabel::testing
