// One suite for all watchers, on real folders: what every finished call leaves behind is heard of.
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gtest/gtest.h>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "linux/watch/FolderWatcher.h"
#include "mirabel/UniqueFd.h"
#include "support/TempHome.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

class FolderWatcherTest : public ::testing::TestWithParam<WatcherKind> {
 protected:
  void SetUp() override {
    for (const char* folder : {"a", "a/sub", "b", "elsewhere"})
      home_.makeFolder(folder);
    home_.writeFile("a/f", "x");
    home_.writeFile("elsewhere/f", "x");
    auto made = makeWatcher(GetParam());
    if (!made) GTEST_SKIP() << made.error().description();
    watcher_ = std::move(*made);
    if (auto watched = watch("a", 1); !watched) GTEST_SKIP() << watched.error().description();
    ASSERT_TRUE(watch("b", 2));
  }

  Result<void> watch(const std::string& folder, std::uint64_t id) {
    const UniqueFd opened(::open(at(folder).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    return watcher_->watch(opened.get(), id);
  }
  std::string at(const std::string& relative) const { return home_.at(relative); }

  LookList drain() {
    LookList looks;
    auto drained = watcher_->drain(looks);
    EXPECT_TRUE(drained);
    EXPECT_FALSE(drained->hasLost);
    return looks;
  }
  static bool has(const LookList& looks, std::uint64_t folder, const std::string& name) {
    const auto names = looks.folders().find(folder);
    return names != looks.folders().end() && names->second.contains(name);
  }

  testing::TempHome home_;
  std::unique_ptr<FolderWatcher> watcher_;
};

TEST_P(FolderWatcherTest, AFolderThatGotAnotherNumberIsHeardOfUnderThatAlone) {
  ASSERT_TRUE(watch("a", 7));
  watcher_->forget(1);
  std::ofstream(at("a/f")) << "longer";
  const LookList looks = drain();
  EXPECT_TRUE(has(looks, 7, "f"));
  EXPECT_FALSE(has(looks, 1, "f"));
}

TEST_P(FolderWatcherTest, HearsOfEveryCallThatHasReturned) {
  struct Case {
    const char* what;
    std::function<void()> change;
    std::vector<std::pair<std::uint64_t, const char*>> places;
  };
  const auto rename = [&](const char* from, const char* to, unsigned flags = 0) {
    return [=, this] {
      ASSERT_EQ(::renameat2(AT_FDCWD, at(from).c_str(), AT_FDCWD, at(to).c_str(), flags), 0);
    };
  };
  const std::vector<Case> cases = {
      {"create", [&] { std::ofstream(at("a/new")) << ""; }, {{1, "new"}}},
      {"write", [&] { std::ofstream(at("a/f")) << "longer"; }, {{1, "f"}}},
      {"truncate", [&] { ASSERT_EQ(::truncate(at("a/f").c_str(), 1), 0); }, {{1, "f"}}},
      {"chmod", [&] { ::chmod(at("a/f").c_str(), 0600); }, {{1, "f"}}},
      {"chmod of the folder", [&] { ::chmod(at("a").c_str(), 0700); }, {{1, ""}}},
      {"utimens", [&] { ::utimensat(AT_FDCWD, at("a/f").c_str(), nullptr, 0); }, {{1, "f"}}},
      {"xattr",
       [&] { ASSERT_EQ(::setxattr(at("a/f").c_str(), "user.com.norvane.t", "1", 1, 0), 0); },
       {{1, "f"}}},
      {"link", [&] { ASSERT_EQ(::link(at("a/f").c_str(), at("b/l").c_str()), 0); }, {{2, "l"}}},
      {"link from elsewhere",
       [&] { ASSERT_EQ(::link(at("elsewhere/f").c_str(), at("b/m").c_str()), 0); },
       {{2, "m"}}},
      {"symlink", [&] { ASSERT_EQ(::symlink("x", at("a/s").c_str()), 0); }, {{1, "s"}}},
      {"mkdir", [&] { fs::create_directory(at("a/d")); }, {{1, "d"}}},
      {"rename", rename("a/new", "a/newer"), {{1, "new"}, {1, "newer"}}},
      {"move", rename("a/newer", "b/newer"), {{1, "newer"}, {2, "newer"}}},
      {"rename over", rename("b/newer", "b/l"), {{2, "newer"}, {2, "l"}}},
      {"exchange", rename("a/f", "b/l", RENAME_EXCHANGE), {{1, "f"}, {2, "l"}}},
      {"move of a folder", rename("a/d", "b/d"), {{1, "d"}, {2, "d"}}},
      {"move in", rename("elsewhere/f", "a/in"), {{1, "in"}}},
      {"move out", rename("a/in", "elsewhere/out"), {{1, "in"}}},
      {"unlink", [&] { fs::remove(at("a/s")); }, {{1, "s"}}},
      {"rmdir", [&] { fs::remove(at("b/d")); }, {{2, "d"}}},
  };
  for (const Case& one : cases) {
    one.change();
    const LookList looks = drain();
    for (const auto& [folder, name] : one.places)
      EXPECT_TRUE(has(looks, folder, name)) << one.what << " " << folder << "/" << name;
  }
  EXPECT_TRUE(drain().isEmpty());
}

TEST_P(FolderWatcherTest, FollowsAFolderThatMovesAndForgetsOneThatItIsTold) {
  ASSERT_TRUE(watch("a/sub", 3));
  fs::rename(at("a/sub"), at("b/moved"));
  static_cast<void>(drain());
  std::ofstream(at("b/moved/inside")) << "x";
  EXPECT_TRUE(has(drain(), 3, "inside"));
  watcher_->forget(3);
  EXPECT_FALSE(watcher_->isWatched(3));
  std::ofstream(at("b/moved/more")) << "x";
  EXPECT_FALSE(drain().folders().contains(3));
  EXPECT_EQ(watcher_->watchedFolders(), 2u);
}

TEST_P(FolderWatcherTest, TellsThatRecordsWereDropped) {
  if (GetParam() == WatcherKind::fileSystemMark) GTEST_SKIP() << "the same queue as with marks";
  // More than any queue holds, of names that can't be merged.
  const auto limit = [](const char* file) {
    std::size_t value = 16384;
    std::ifstream(file) >> value;
    return value;
  };
  const std::size_t names =
      limit(GetParam() == WatcherKind::inotify ? "/proc/sys/fs/inotify/max_queued_events"
                                               : "/proc/sys/fs/fanotify/max_queued_events") +
      10;
  if (names > 100'000) GTEST_SKIP() << "the queue is too long to be filled";
  // One file under ever other names: a small file system has not so many inodes.
  std::string name = at("a/f");
  for (std::size_t i = 0; i < names; ++i) {
    const std::string next = at("b/") + std::to_string(i);
    ASSERT_EQ(::rename(name.c_str(), next.c_str()), 0);
    name = next;
  }
  LookList looks;
  auto drained = watcher_->drain(looks);
  ASSERT_TRUE(drained);
  EXPECT_TRUE(drained->hasLost);
}

TEST_P(FolderWatcherTest, RefusesWhatIsNoFolder) {
  const UniqueFd file(::open(at("a/f").c_str(), O_PATH | O_CLOEXEC));
  if (GetParam() == WatcherKind::fileSystemMark) return;  // hears of it anyway
  EXPECT_FALSE(watcher_->watch(file.get(), 9));
  EXPECT_FALSE(watcher_->isWatched(9));
}

INSTANTIATE_TEST_SUITE_P(Watchers, FolderWatcherTest,
                         ::testing::Values(WatcherKind::folderMarks, WatcherKind::inotify,
                                           WatcherKind::fileSystemMark));

}  // namespace
}  // namespace mirabel
