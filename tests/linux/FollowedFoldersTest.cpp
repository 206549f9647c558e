#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <limits>
#include <map>
#include <optional>
#include <set>
#include <sys/stat.h>

#include "linux/FailingLooks.h"
#include "linux/PrivateMount.h"
#include "linux/VolumeFixture.h"
#include "linux/volume/FollowedFolders.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

constexpr std::uint64_t noLater = std::numeric_limits<std::uint64_t>::max();

/// Folders of applications beside the document storage, with every way of hearing of changes.
class FollowedFoldersTest : public VolumeFixture,
                            public ::testing::WithParamInterface<std::optional<WatcherKind>> {
 protected:
  void SetUp() override {
    if (GetParam()) makeWatcher_ = [] { return makeWatcher(*GetParam()); };
    for (const char* application : {"one", "two"}) {
      fs::create_directories(libraryOf(application) + "/sub");
      writeTo(libraryOf(application) + "/sub/a.txt");
    }
  }

  std::string libraryOf(const std::string& application) const {
    return base_ + "/apps/" + application + "/Documents";
  }
  void writeTo(const std::string& path) const { write(fs::relative(path, documents_).native()); }

  void follow(const std::vector<FollowedFolder>& folders, std::uint64_t version) {
    const auto done = index().follow(folders, version);
    ASSERT_TRUE(done) << done.error().description();
  }
  std::uint32_t documentAt(const std::string& path) {
    const auto seen = index().learnPath(path, statusOf(path).value(), false);
    return seen ? seen->documentID : 0;
  }

  void list(const std::string& folder, const std::vector<std::string>& names) {
    const UniqueFd opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    std::vector<Sighting> sightings;
    for (const std::string& name : names)
      sightings.push_back({name, statusAt(opened.get(), name).value()});
    EXPECT_TRUE(index().learn(folder, opened.get(), sightings));
  }

  /// The paths that were told since, below the folder of all, and the documents that are gone.
  struct Told {
    std::set<std::string> paths;
    std::set<std::uint32_t> goneDocuments;
  };
  Told toldSince(std::uint64_t since) {
    anchor();
    Told told;
    const auto records = index().events(since, 1000).value();
    for (const JournalRecord& record : records) {
      if (!record.isDocument) told.paths.insert(record.path.substr(base_.size() + 1));
      if (record.isDocument && record.destination == 0)
        told.goneDocuments.insert(record.documentID);
    }
    return told;
  }
  static std::set<std::string> contentsOf(const std::string& application) {
    const std::string library = "apps/" + application + "/Documents";
    return {library, library + "/sub", library + "/sub/a.txt"};
  }
};

TEST_P(FollowedFoldersTest, WhatComesAndGoesWithThemIsTold) {
  const std::uint64_t start = anchor();
  writeTo(libraryOf("one") + "/sub/unseen.txt");
  EXPECT_TRUE(toldSince(start).paths.empty()) << "nobody asked for it";
  fs::remove(libraryOf("one") + "/sub/unseen.txt");

  follow({{libraryOf("one"), "One"}}, 1);
  EXPECT_EQ(toldSince(start).paths, contentsOf("one"));
  const std::uint32_t document = documentAt(libraryOf("one") + "/sub/a.txt");
  EXPECT_NE(document, 0u);

  const std::uint64_t between = anchor();
  follow({{libraryOf("one"), "One"}}, 1);
  EXPECT_EQ(anchor(), between) << "nothing new";
  follow({{libraryOf("two"), "Two"}, {libraryOf("one"), "Uno"}}, 2);
  auto expected = contentsOf("two");
  expected.insert("apps/one/Documents");
  EXPECT_EQ(toldSince(between).paths, expected) << "one is called otherwise";

  writeTo(libraryOf("two") + "/new.txt");
  EXPECT_TRUE(toldSince(between).paths.contains("apps/two/Documents/new.txt")) << "it is followed";

  const std::uint64_t last = anchor();
  follow({}, 3);
  const Told gone = toldSince(last);
  EXPECT_TRUE(gone.paths.contains("apps/one/Documents/sub/a.txt"));
  EXPECT_TRUE(gone.paths.contains("apps/two/Documents/new.txt"));
  EXPECT_TRUE(gone.goneDocuments.contains(document));
  writeTo(libraryOf("one") + "/sub/later.txt");
  const std::uint64_t end = anchor();
  EXPECT_TRUE(toldSince(end).paths.empty());

  // Who holds what a version showed hears of all that came after it.
  EXPECT_EQ(index().lastEventUnder(0), start);
  EXPECT_EQ(index().lastEventUnder(1), between);
  EXPECT_EQ(index().lastEventUnder(2), last);
  EXPECT_EQ(index().lastEventUnder(3), noLater);
}

// As whoever reads of what left does: a client that has not heard of it yet.
TEST_P(FollowedFoldersTest, WhatWasLookedAtWhileNobodyFollowedThemIsToldWhenTheyCome) {
  const std::string library = libraryOf("one");
  fs::create_hard_link(library + "/sub/a.txt", path("linked.txt"));
  fs::create_hard_link(library + "/sub/a.txt", library + "/linked.txt");
  auto expected = contentsOf("one");
  expected.insert("apps/one/Documents/linked.txt");
  const auto lookAt = [&](const std::vector<const char*>& places) {
    for (const char* place : places)
      documentAt(library + place);
  };
  const std::function<void()> looks[] = {
      [&] {
        lookAt({"/sub/a.txt", "/sub", "/linked.txt", ""});
      },
      [&] {
        lookAt({"", "/linked.txt", "/sub", "/sub/a.txt"});
      },
      [&] {
        list(library, {"sub", "linked.txt"}), list(library + "/sub", {"a.txt"});
      }};
  std::uint64_t version = 0;
  for (const auto& look : looks) {
    follow({{library, "One"}}, ++version);
    anchor();
    follow({}, ++version);
    look();
    const std::uint64_t since = anchor();
    follow({{library, "One"}}, ++version);
    EXPECT_THAT(toldSince(since).paths, ::testing::IsSupersetOf(expected));
    EXPECT_EQ(index().pathsOfFileID(inode("linked.txt")).value().size(), 3u);
  }
}

TEST_P(FollowedFoldersTest, AreKnownToTheNextProcess) {
  const std::uint64_t start = anchor();
  follow({{libraryOf("one"), "One"}, {libraryOf("two"), "Two"}}, 7);
  const std::uint32_t document = documentAt(libraryOf("one") + "/sub/a.txt");
  const std::uint64_t since = anchor();
  close();
  // Meanwhile one moved its file into the documents, and two lost its folder.
  fs::rename(libraryOf("one") + "/sub/a.txt", path("a.txt"));
  fs::remove_all(libraryOf("two"));
  const Told told = toldSince(since);
  EXPECT_TRUE(told.paths.contains("apps/one/Documents/sub/a.txt"));
  EXPECT_TRUE(told.paths.contains("Documents/a.txt"));
  EXPECT_TRUE(told.paths.contains("apps/two/Documents/sub/a.txt"));
  EXPECT_EQ(findDocument(document), "a.txt") << "it is the same document";
  EXPECT_EQ(index().lastEventUnder(6), start);
  EXPECT_EQ(index().lastEventUnder(7), noLater);

  const std::uint64_t later = anchor();
  fs::create_directories(libraryOf("two") + "/sub");
  writeTo(libraryOf("two") + "/sub/a.txt");
  EXPECT_EQ(toldSince(later).paths, contentsOf("two")) << "its folder was made again";
}

TEST_P(FollowedFoldersTest, ALinkInThePlaceOfOneLeadsNowhere) {
  follow({{libraryOf("one"), "One"}}, 1);
  const std::uint64_t since = anchor();
  fs::rename(base_ + "/apps/one", base_ + "/elsewhere");
  fs::create_directory_symlink(base_ + "/elsewhere", base_ + "/apps/one");
  const auto gone = toldSince(since);
  EXPECT_TRUE(gone.paths.contains("apps/one/Documents/sub/a.txt")) << "it is told as gone";
  const std::uint64_t later = anchor();
  writeTo(base_ + "/elsewhere/Documents/more.txt");
  EXPECT_TRUE(toldSince(later).paths.empty());
}

TEST_P(FollowedFoldersTest, ADeadMountOverOneHidesItAndOverTheDocumentsIsAnError) {
  follow({{libraryOf("one"), "One"}, {libraryOf("two"), "Two"}}, 1);
  write("a.txt");
  const std::uint64_t since = anchor();
  for (const std::string& folder : {libraryOf("two"), documents_}) {
    close();  // what is open belongs to the mounts of before
    const PrivateMount mounted(folder);
    if (!mounted.isThere()) GTEST_SKIP() << "may not mount";
    const auto device = statusOf(folder).value().device;
    const FailingLooks failing([&](int directory, const char* name) {
      struct stat status;
      const bool isIt = *name == '\0' && ::fstat(directory, &status) == 0;
      return folder == name || (isIt && status.st_dev == device) ? ENOTCONN : 0;
    });
    const bool isOpen = folder != documents_;
    ASSERT_EQ(tryOpen().has_value(), isOpen);
    EXPECT_TRUE(!isOpen || index().currentEventID());
  }
  const Told told = toldSince(since);
  EXPECT_TRUE(told.paths.contains("apps/two/Documents/sub/a.txt")) << "gone, and there again";
  EXPECT_FALSE(told.paths.contains("Documents/a.txt"));
}

TEST_P(FollowedFoldersTest, AMountThatComesOrGoesBelowOneIsTold) {
  fs::create_directory(documents_ + "/m");
  write("m/a.txt");
  const PrivateMount namespaceOfItsOwn(base_ + "/apps");
  if (!namespaceOfItsOwn.isThere()) GTEST_SKIP() << "may not mount";
  const std::string folder = documents_ + "/m";
  const std::uint64_t before = anchor();
  ASSERT_EQ(::mount("none", folder.c_str(), "tmpfs", 0, nullptr), 0);
  EXPECT_TRUE(toldSince(before).paths.contains("Documents/m/a.txt"));
  const std::uint64_t under = anchor();
  ASSERT_EQ(::umount(folder.c_str()), 0);
  EXPECT_TRUE(toldSince(under).paths.contains("Documents/m/a.txt"));
  const std::uint64_t after = anchor();
  write("m/b.txt");
  EXPECT_TRUE(toldSince(after).paths.contains("Documents/m/b.txt"));
}

INSTANTIATE_TEST_SUITE_P(Watching, FollowedFoldersTest,
                         ::testing::Values(std::nullopt, WatcherKind::folderMarks,
                                           WatcherKind::inotify));

}  // namespace
}  // namespace mirabel
