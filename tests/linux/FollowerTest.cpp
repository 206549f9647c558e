// The index follows what happens on disk: after any burst, drop or refusal it is in step, and a
// comparison of everything finds nothing more.
#include "linux/FollowerTest.h"

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <optional>
#include <set>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "support/OrdinaryUser.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

TEST_P(FollowerTest, WhatHappensIsToldWithoutAComparison) {
  struct Case {
    const char* what;
    std::function<void()> change;
    std::set<std::string> told;
  };
  makeFolder("a/b");
  makeFolder("c");
  write("a/f");
  write("a/b/deep");
  std::uint64_t since = anchor();
  const std::vector<Case> cases = {
      {"nothing", [] {}, {}},
      {"write", [&] { write("a/f", "longer"); }, {"/a/f"}},
      {"create", [&] { write("c/new"); }, {"/c", "/c/new"}},
      {"move", [&] { rename("c/new", "a/new"); }, {"/a", "/c", "/a/new", "/c/new"}},
      {"delete", [&] { remove("a/new"); }, {"/a", "/a/new"}},
      {"move of a folder", [&] { rename("a/b", "c/b"); }, {"/a", "/c", "/a/b", "/c/b"}},
      {"in a moved folder", [&] { write("c/b/deep", "longer"); }, {"/c/b/deep"}},
      {"a new tree",
       [&] {
         makeFolder("t/u/v");
         write("t/u/v/w");
       },
       {"/t", "/t/u", "/t/u/v", "/t/u/v/w"}},
      {"in the new tree", [&] { write("t/u/v/w", "longer"); }, {"/t/u/v/w"}},
      {"out", [&] { fs::rename(path("t"), base_ + "/out"); }, {"/t", "/t/u", "/t/u/v", "/t/u/v/w"}},
      {"out of sight", [&] { std::ofstream(base_ + "/out/u/x"); }, {}},
      {"a part comes back",
       [&] { fs::rename(base_ + "/out/u", path("c/u")); },
       {"/c", "/c/u", "/c/u/x", "/c/u/v", "/c/u/v/w"}},
      {"in it", [&] { write("c/u/x", "longer"); }, {"/c/u/x"}},
  };
  for (const Case& one : cases) {
    one.change();
    const std::uint64_t now = anchor();
    EXPECT_EQ(told(since), one.told) << one.what;
    expectInStep(one.what);
    since = now;
  }
}

TEST_P(FollowerTest, WhatChangesWhileFoldersAreReadIsTakenIn) {
  constexpr int folders = 60;
  const auto folder = [](int number) { return "d" + std::to_string(number % folders); };
  for (int i = 0; i < folders; ++i) {
    makeFolder(folder(i) + "/sub");
    write(folder(i) + "/f");
    write(folder(i) + "/sub/g");
  }
  int number = 0;
  const auto disturb = [&] {
    const int now = number++;
    if (now >= 2 * folders) return;
    write(folder(now) + "/late" + std::to_string(now));
    std::error_code gone;
    fs::rename(path(folder(now) + "/f"), path(folder(now + 7) + "/moved"), gone);
    if (now % 5 != 0) return;
    // Another folder comes to the place of one that goes elsewhere.
    fs::rename(path(folder(now + 11) + "/sub"), path(folder(now + 1) + "/gone"), gone);
    makeFolder(folder(now + 11) + "/sub");
    write(folder(now + 11) + "/sub/other");
  };
  faults_->beforeWatch = faults_->afterWatch = disturb;
  const std::uint64_t since = anchor();
  EXPECT_GE(number, folders);
  faults_->beforeWatch = faults_->afterWatch = nullptr;
  expectInStep("after the first look");
  // The same while changes are followed: a tree comes in from elsewhere.
  fs::create_directory(base_ + "/out");
  for (int i = 0; i < folders; ++i)
    fs::rename(path(folder(i)), base_ + "/out/" + folder(i));
  anchor();
  number = 2 * folders;
  faults_->afterWatch = [&] {
    const int now = number++ - 2 * folders;
    if (now < folders) write("in/" + folder(now) + "/later");
  };
  fs::rename(base_ + "/out", path("in"));
  anchor();
  faults_->afterWatch = nullptr;
  expectInStep("after the tree came in");
  EXPECT_TRUE(told(since).contains("/in/d3/later"));
}

TEST_P(FollowerTest, ADroppedRecordCostsAComparisonAndNothingElse) {
  makeFolder("a");
  const std::uint64_t since = anchor();
  for (int round = 0; round < 5; ++round) {
    const std::string name = "a/f" + std::to_string(round);
    write(name);
    faults_->loses = true;
    const auto paths = told((anchor(), since));
    EXPECT_TRUE(paths.contains("/" + name));
    write(name, "longer");
    expectInStep(name.c_str());
  }
  EXPECT_EQ(faults_->made, 1) << "what is watched stays watched";
}

TEST_P(FollowerTest, WithTooFewMarksEveryQuestionIsAnsweredByAComparison) {
  for (int i = 0; i < 20; ++i)
    makeFolder("folder" + std::to_string(i));
  faults_->marks = 10;
  std::uint64_t since = anchor();
  ASSERT_EQ(notices_.size(), 1u);
  EXPECT_NE(notices_[0].find("needs 21 marks"), std::string::npos) << notices_[0];
  EXPECT_NE(notices_[0].find("sysctl"), std::string::npos) << notices_[0];
  const auto status = index().status().following;
  EXPECT_FALSE(status.watcher);
  EXPECT_EQ(status.marksNeeded, 21u);
  EXPECT_TRUE(status.refusal && status.refusal->isPosix(ENOSPC));
  for (int i = 0; i < 20; ++i) {
    const std::string name = "folder" + std::to_string(i) + "/f";
    write(name);
    const std::uint64_t now = anchor();
    EXPECT_TRUE(told(since).contains("/" + name));
    since = now;
  }
  EXPECT_EQ(notices_.size(), 1u) << "said once";
}

TEST_P(FollowerTest, NewMarksThatRunOutEndTheWatchingAndNotTheTelling) {
  makeFolder("a");
  std::uint64_t since = anchor();
  faults_->marks = 4;
  for (int i = 0; i < 8; ++i) {
    makeFolder("a/" + std::to_string(i));
    write("a/" + std::to_string(i) + "/f");
    const std::uint64_t now = anchor();
    EXPECT_TRUE(told(since).contains("/a/" + std::to_string(i) + "/f"));
    since = now;
  }
  EXPECT_EQ(notices_.size(), 1u);
}

TEST_P(FollowerTest, ARootThatIsMovedAwayIsEmptyUntilThereIsAnother) {
  makeFolder("a");
  write("a/f");
  const std::uint64_t folder = file("a"), content = file("a/f");
  std::uint64_t since = anchor();
  const auto expectTold = [&](const std::set<std::string>& paths, const char* what) {
    const std::uint64_t now = anchor();
    EXPECT_EQ(told(since), paths) << what;
    since = now;
  };
  fs::rename(documents_, base_ + "/away");
  expectTold({"", "/a", "/a/f"}, "moved away");
  EXPECT_TRUE(index().pathOfFileID(content).error().isPosix(ENOENT));
  fs::create_directory(documents_);
  write("other");
  expectTold({"", "/other"}, "another in its place");
  write("other", "longer");
  expectTold({"/other"}, "which is followed");
  fs::rename(documents_, base_ + "/second");
  fs::rename(base_ + "/away", documents_);
  expectTold({"", "/other", "/a", "/a/f"}, "the first one again");
  EXPECT_EQ(file("a"), folder);
  EXPECT_EQ(file("a/f"), content);
  write("a/f", "longer");
  expectTold({"/a/f"}, "which is followed");
  expectInStep("after all");
}

TEST_P(FollowerTest, AStateFolderInTheDocumentsIsRefused) {
  state_ = path("state");
  EXPECT_TRUE(tryOpen().error().isPosix(EINVAL));
}

// Files made faster than the queue holds, and folders faster than they are watched.
TEST_P(FollowerTest, NothingOfABurstIsMissing) {
  makeFolder("one");
  const std::uint64_t since = anchor();
  // One queue is like the other, and a comparison of so much takes its time.
  const bool isShort = GetParam() == WatcherKind::inotify;
  const bool isSmall = std::getenv("MIRABEL_TEST_DIR") != nullptr;  // as test images are
  const int files = isSmall ? 2'000 : isShort ? 20'000 : 50'000;
  const int folders = isSmall ? 60 : isShort ? 200 : 1000;
  for (int i = 0; i < files; ++i) {
    const UniqueFd made(::open(path("one/" + std::to_string(i)).c_str(), O_CREAT | O_WRONLY, 0600));
    ASSERT_TRUE(made);
  }
  anchor();
  EXPECT_EQ(told(since).size(), static_cast<std::size_t>(files) + 1);

  std::atomic<bool> isDone = false;
  std::thread writer([&] {
    for (int i = 0; i < folders; ++i) {
      const std::string folder = path("f" + std::to_string(i));
      ::mkdir(folder.c_str(), 0700);
      for (int j = 0; j < 50; ++j) {
        const std::string file = folder + "/" + std::to_string(j);
        const UniqueFd made(::open(file.c_str(), O_CREAT | O_WRONLY, 0600));
      }
    }
    isDone = true;
  });
  const std::uint64_t before = index().status().lastEventID;
  while (!isDone)
    anchor();
  writer.join();
  anchor();
  EXPECT_EQ(told(before).size(), static_cast<std::size_t>(folders) * 51);
  expectInStep("after a burst of folders");
}

// As archives are unpacked and version control checks out: temporary names, renames into place,
// folders that are made and go again, while the index is asked all the time.
TEST_P(FollowerTest, AnUnpackedTreeIsInStepWhileItIsWritten) {
  anchor();
  std::atomic<bool> isDone = false;
  std::thread writer([&] {
    for (int i = 0; i < 150; ++i) {
      const std::string folder = path("pack" + std::to_string(i));
      fs::create_directories(folder + ".tmp/objects/in");
      for (int j = 0; j < 10; ++j) {
        const std::string temporary = folder + ".tmp/objects/tmp" + std::to_string(j);
        const UniqueFd made(::open(temporary.c_str(), O_CREAT | O_WRONLY, 0600));
        ::rename(temporary.c_str(), (folder + ".tmp/objects/in/o" + std::to_string(j)).c_str());
      }
      ::rename((folder + ".tmp").c_str(), folder.c_str());
      if (i % 3 == 0) fs::remove_all(folder);
      if (i % 5 == 1) ::rename((folder + "/objects").c_str(), (folder + ".moved").c_str());
      const std::string config = path("config");
      const UniqueFd lock(::open((config + ".lock").c_str(), O_CREAT | O_WRONLY, 0600));
      ::rename((config + ".lock").c_str(), config.c_str());
    }
    isDone = true;
  });
  while (!isDone)
    EXPECT_TRUE(index().currentEventID());
  writer.join();
  expectInStep("after an unpacked tree");
}

// Every mode that leaves its owner less than reading and looking up.
constexpr mode_t closedModes[] = {0, 0100, 0200, 0300, 0311, 0400, 0444, 0600, 0644};

/// What an ordinary user owns: the administrator reads everything.
class ClosedFolders : public FollowerTest {
 protected:
  void SetUp() override {
    FollowerTest::SetUp();
    if (IsSkipped()) return;
    makeFolder("a/b");
    write("a/b/f");
    write("a/g");
    if (testing::OrdinaryUser::isRoot()) {
      for (const auto& entry : fs::recursive_directory_iterator(base_))
        ASSERT_EQ(::chown(entry.path().c_str(), testing::OrdinaryUser::substitute, 0), 0);
      ASSERT_EQ(::chown(base_.c_str(), testing::OrdinaryUser::substitute, 0), 0);
    }
    user_.emplace();
    since_ = anchor();
  }

  void TearDown() override {
    setMode("", 0755);
    setMode("a", 0755);
    close();
    user_.reset();
  }

  void setMode(std::string_view relative, mode_t mode) {
    ASSERT_EQ(::chmod(path(relative).c_str(), mode), 0) << relative;
  }
  /// What is told since the last call.
  std::set<std::string> news() {
    const std::uint64_t since = std::exchange(since_, anchor());
    return told(since);
  }

  const std::set<std::string> all_{"/a", "/a/b", "/a/b/f", "/a/g"};
  std::optional<testing::OrdinaryUser> user_;
  std::uint64_t since_ = 0;
};

TEST_P(ClosedFolders, HoldNothingUntilTheyAreOpened) {
  const std::uint64_t deep = file("a/b/f"), near = file("a/g");
  for (const mode_t mode : closedModes) {
    SCOPED_TRACE(mode);
    setMode("a", mode);
    EXPECT_EQ(news(), all_);
    EXPECT_EQ(index().status().following.unreadableFolders, 1u);
    // Nor is it found by name, as it could be in some of them.
    EXPECT_EQ(findFile(deep), "");
    EXPECT_EQ(findFile(near), "");
    expectInStep("closed");
    EXPECT_EQ(news(), std::set<std::string>());
    setMode("a", 0755);
    EXPECT_EQ(news(), all_);
    EXPECT_EQ(findFile(deep), "a/b/f");
    EXPECT_EQ(findFile(near), "a/g");
    EXPECT_EQ(index().status().following.unreadableFolders, 0u);
    write("a/b/f", std::to_string(mode));
    EXPECT_EQ(news(), std::set<std::string>{"/a/b/f"});
    expectInStep("opened");
  }
}

TEST_P(ClosedFolders, AreHeardOfWhenTheyOpenHoweverTheyWereMet) {
  for (const mode_t mode : closedModes) {
    SCOPED_TRACE(mode);
    setMode("a", mode);
    EXPECT_EQ(news(), all_);
    close();  // the next process meets it closed
    EXPECT_EQ(news(), std::set<std::string>());
    std::set<std::string> opened = all_;
    if ((mode & 0300) == 0300) {
      write("a/h");
      EXPECT_EQ(news(), std::set<std::string>{"/a"}) << "its dates";
      opened.insert("/a/h");
    }
    setMode("a", 0755);
    EXPECT_EQ(news(), opened);
    if (opened != all_) {
      remove("a/h");
      news();
    }
    // One that was made and closed before anybody could watch it.
    makeFolder("new");
    write("new/f");
    setMode("new", mode);
    EXPECT_EQ(news(), std::set<std::string>{"/new"});
    setMode("new", 0755);
    EXPECT_EQ(news(), (std::set<std::string>{"/new", "/new/f"}));
    write("new/f", "longer");
    EXPECT_EQ(news(), std::set<std::string>{"/new/f"});
    remove("new");
    EXPECT_EQ(news(), (std::set<std::string>{"/new", "/new/f"}));
    expectInStep("at the end");
  }
}

TEST_P(ClosedFolders, WhichHoldEverythingAreAnErrorAndNoDeletion) {
  const std::uint64_t deep = file("a/b/f");
  for (const mode_t mode : closedModes) {
    SCOPED_TRACE(mode);
    for (const bool isMetClosed : {false, true}) {
      setMode("", mode);
      if (isMetClosed) close();
      for (int i = 0; i < 2; ++i) {
        const auto id = index().currentEventID();
        ASSERT_FALSE(id);
        EXPECT_TRUE(id.error().isPosix(EACCES)) << id.error().description();
        EXPECT_NE(id.error().description().find(documents_), std::string::npos);
        EXPECT_TRUE(index().pathOfFileID(deep).error().isPosix(EACCES));
      }
      setMode("", 0755);
      EXPECT_EQ(news(), std::set<std::string>());
      EXPECT_EQ(findFile(deep), "a/b/f");
    }
    write("a/b/f", std::to_string(mode));
    EXPECT_EQ(news(), std::set<std::string>{"/a/b/f"});
  }
}

INSTANTIATE_TEST_SUITE_P(Watchers, ClosedFolders,
                         ::testing::Values(WatcherKind::folderMarks, WatcherKind::inotify),
                         [](const auto& instance) {
                           return instance.param == WatcherKind::inotify ? "Inotify"
                                                                         : "FolderMarks";
                         });

INSTANTIATE_TEST_SUITE_P(Watchers, FollowerTest,
                         ::testing::Values(WatcherKind::folderMarks, WatcherKind::inotify),
                         [](const auto& instance) {
                           return instance.param == WatcherKind::inotify ? "Inotify"
                                                                         : "FolderMarks";
                         });

}  // namespace
}  // namespace mirabel
