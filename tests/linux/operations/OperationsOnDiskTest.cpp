#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "linux/operations/OperationsFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

/// What only a real disk has: permissions, sparse files, several names of one file, odd names.
class OperationsOnDisk : public OperationsTest {
 protected:
  struct stat statusOf(std::string_view name) const {
    struct stat status {};
    EXPECT_EQ(::lstat(home.at(name).c_str(), &status), 0) << name;
    return status;
  }
};

TEST_F(OperationsOnDisk, AnImportedTreeIsLikeItsSource) {
  const std::string source = home.path() + "/source";
  fs::create_directories(source + "/sub/\xFF");
  std::ofstream(source + "/sub/\xFF/file") << "contents";
  fs::create_hard_link(source + "/sub/\xFF/file", source + "/second name");
  fs::create_symlink("../away", source + "/sub/link");
  ASSERT_EQ(::mkfifo((source + "/fifo").c_str(), 0600), 0);
  std::ofstream(source + "/sparse") << "begin";
  fs::resize_file(source + "/sparse", 64 << 20);
  ASSERT_EQ(::chmod((source + "/sub/\xFF/file").c_str(), 0440), 0);
  ASSERT_EQ(::chmod((source + "/sub").c_str(), 0550), 0);
  const timespec times[] = {{1'000'000, 1}, {2'000'000, 123'456'789}};
  ASSERT_EQ(::utimensat(AT_FDCWD, (source + "/sub").c_str(), times, 0), 0);
  const bool hasAttributes = ::setxattr((source + "/sub").c_str(), "user.mine", "value", 5, 0) == 0;

  EXPECT_EQ(import(source, "").value().path(), home.at("source"));
  EXPECT_EQ(tree("source"), tree("../source"));
  for (const char* name : {"/sub", "/sub/\xFF/file", "/fifo", "/sparse"}) {
    const struct stat copy = statusOf("source" + std::string(name));
    const struct stat original = statusOf("../source" + std::string(name));
    EXPECT_EQ(copy.st_mode, original.st_mode) << name;
    EXPECT_EQ(copy.st_mtim.tv_sec, original.st_mtim.tv_sec) << name;
    EXPECT_EQ(copy.st_mtim.tv_nsec, original.st_mtim.tv_nsec) << name;
  }
  EXPECT_EQ(statusOf("source/sub/\xFF/file").st_ino, statusOf("source/second name").st_ino);
  EXPECT_LT(statusOf("source/sparse").st_blocks, 2048);
  char value[8];
  if (hasAttributes) {
    EXPECT_EQ(::getxattr(home.at("source/sub").c_str(), "user.mine", value, sizeof value), 5);
  }
  for (const std::string& folder : {source + "/sub", home.at("source/sub")})
    fs::permissions(folder, fs::perms::owner_all);
}

TEST_F(OperationsOnDisk, WhatMayNotBeChangedStaysWhole) {
  for (const char* folder : {"closed/sub", "open/closed"})
    makeFolder(folder);
  for (const char* file : {"closed/file", "open/a", "open/closed/file"})
    home.writeFile(file, file);
  makeFolder("target");
  home.setMode("open/closed", 0555);
  home.setMode("closed", 0555);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  {
    const OrdinaryUser user;
    const Tree before = tree();
    // A folder in the midst of it that may not be emptied: nothing of the rest goes either.
    EXPECT_TRUE(remove("open")->isPosix(EACCES));
    EXPECT_TRUE(remove("closed/file")->isPosix(EACCES));
    EXPECT_EQ(failureOf(trash("closed/file")), EACCES);
    EXPECT_EQ(failureOf(move("closed/file", "target")), EACCES);
    EXPECT_EQ(failureOf(rename("closed/file", "other")), EACCES);
    EXPECT_EQ(failureOf(createFolder("closed", "new")), EACCES);
    EXPECT_EQ(failureOf(import(home.at("open/a"), "closed")), EACCES);
    Tree after = tree();
    after.erase(".Trash");
    EXPECT_EQ(after, before);
    EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
  }
  home.setMode("closed", 0755);
  home.setMode("open/closed", 0755);
}

TEST_F(OperationsOnDisk, RootsAndWhatLiesOutsideThemAreNotChanged) {
  std::ofstream(home.path() + "/outside") << "mine";
  fs::create_directory(home.path() + "/folder");
  makeFolder("sub");
  home.makeSymlink("way out", home.path());
  EXPECT_EQ(failureOf(rename("", "Other")), EPERM);
  EXPECT_EQ(failureOf(rename("../outside", "other")), EXDEV);
  EXPECT_TRUE(remove("")->isPosix(EPERM));
  EXPECT_TRUE(remove("../outside")->isPosix(EXDEV));
  EXPECT_TRUE(remove("sub/.")->isPosix(EPERM));
  EXPECT_TRUE(remove("way out/outside"));
  EXPECT_FALSE(createFolder("way out", "new"));
  EXPECT_FALSE(import(home.path() + "/outside", "way out"));
  EXPECT_TRUE(fs::exists(home.path() + "/outside"));
  EXPECT_TRUE(fs::exists(home.at("sub")));
  // As a source it may be anywhere.
  EXPECT_TRUE(import(home.path() + "/outside", "sub"));
}

// As a folder of an overlay's lower layers is, which every rename has to copy.
TEST_F(OperationsOnDisk, WhatCanNotBeRenamedIsSaidToBeSo) {
  makeFolder("folder");
  makeFolder("target");
  setCheck([](std::string_view call) { return call == "rename" ? EXDEV : 0; });
  for (const Result<URL>& outcome : {rename("folder", "new"), move("folder", "target")}) {
    EXPECT_EQ(outcome.error(),
              Error::posix(ENOTSUP, "it can't be renamed on this kind of file system"));
  }
  EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
  EXPECT_EQ(tree().size(), 2U);
}

TEST_F(OperationsOnDisk, ManyOfOneNameFindFreeNamesQuickly) {
  makeFolder("from");
  int looks = 0;
  for (int i = 1; i <= 300; ++i) {
    home.writeFile("from/same.txt", std::to_string(i));
    looks = 0;
    setCheck([&](std::string_view) { return ++looks, 0; });
    ASSERT_TRUE(trash("from/same.txt"));
    setCheck({});
  }
  EXPECT_EQ(tree(".Trash").size(), 300U);
  EXPECT_EQ(tree(".Trash").at("same.txt"), "1");
  EXPECT_EQ(tree(".Trash").at("same 300.txt"), "300");
  EXPECT_LT(looks, 100);
}

/// Where one folder answers to two spellings of its name, as in a folder that takes them for the
/// same: here it is mounted at the second as well.
class TwoSpellings : public OperationsTest {
 protected:
  void SetUp() override {
    makeFolder("readme/inside");
    makeFolder("README");
    const std::string spelling = home.at("README");
    if (::mount(home.at("readme").c_str(), spelling.c_str(), nullptr, MS_BIND, nullptr) != 0)
      GTEST_SKIP() << "nothing may be mounted here";
    isMounted_ = true;
  }
  void TearDown() override { endSecond(); }

  void endSecond() {
    if (!isMounted_) return;
    isMounted_ = false;
    EXPECT_EQ(::umount2(home.at("README").c_str(), MNT_DETACH), 0);
    EXPECT_EQ(::rmdir(home.at("README").c_str()), 0);
  }

  bool isMounted_ = false;
};

TEST_F(TwoSpellings, AreExchangedByWayOfAHiddenName) {
  setCheck([this, renames = 0](std::string_view call) mutable {
    // The old spelling is gone when the item is hidden, and the other with it.
    if (call == "rename" && ++renames == 3) endSecond();
    return 0;
  });
  const auto renamed = rename("readme", "README");
  setCheck({});
  ASSERT_TRUE(renamed) << renamed.error().description();
  EXPECT_EQ(tree(), (Tree{{"README", "/"}, {"README/inside", "/"}}));
  close();
  EXPECT_FALSE(hasPendingWork());
}

TEST_F(TwoSpellings, StayAsTheyAreWhereThatFails) {
  EXPECT_FALSE(rename("readme", "README"));
  close();
  EXPECT_FALSE(hasPendingWork());
  endSecond();
  EXPECT_EQ(tree(), (Tree{{"readme", "/"}, {"readme/inside", "/"}}));
}

/// A second root, on another file system than the home where this machine has one in memory.
class OtherFileSystem : public OperationsTest {
 protected:
  void SetUp() override {
    struct stat here {};
    struct stat there {};
    if (::stat("/dev/shm", &there) != 0 || ::stat(home.path().c_str(), &here) != 0 ||
        here.st_dev == there.st_dev || ::mkdtemp(other_.data()) == nullptr) {
      GTEST_SKIP() << "no other file system here";
    }
    isMade_ = true;
    addRoot(other_);
  }
  void TearDown() override {
    close();
    if (isMade_) fs::remove_all(other_);
  }

  Result<URL> moveTo(const std::string& item, const std::string& folder,
                     std::optional<std::string> name = {}) {
    const URL url = item.starts_with('/') ? URL::fileURL(item) : home.url(item);
    return moveURL(url, URL::fileURL(folder), std::move(name), Bouncing::refused);
  }

  std::string other_ = "/dev/shm/mirabel-home-XXXXXX";
  bool isMade_ = false;
};

TEST_F(OtherFileSystem, TakesItemsWholeAndGivesThemBack) {
  makeFolder("folder/sub");
  home.writeFile("folder/sub/file", "contents");
  home.makeSymlink("folder/link", "sub/file");
  home.writeFile("doc", "document");
  home.setMode("doc", 0440);
  const Tree before = tree();
  ASSERT_TRUE(moveTo("folder", other_));
  const auto doc = moveTo("doc", other_, "letter");
  ASSERT_TRUE(doc) << doc.error().description();
  EXPECT_EQ(tree(), Tree());
  EXPECT_EQ(fs::read_symlink(other_ + "/folder/link"), "sub/file");
  struct stat status {};
  ASSERT_EQ(::stat((other_ + "/letter").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0440U);
  EXPECT_EQ(failureOf(moveTo("doc", other_)), ENOENT);
  home.writeFile("letter", "another");
  EXPECT_TRUE(moveTo("letter", other_).error().is(FileErrorCode::fileExists));
  home.remove("letter");
  EXPECT_TRUE(moveTo(other_ + "/folder", home.documents()));
  EXPECT_TRUE(moveTo(other_ + "/letter", home.documents(), "doc"));
  EXPECT_EQ(tree(), before);
  EXPECT_TRUE(fs::is_empty(other_));
}

TEST_F(OperationsOnDisk, AnotherNameOfTheSameFileIsTaken) {
  home.writeFile("one", "x");
  home.link("one", "two");
  EXPECT_TRUE(rename("one", "two").error().is(FileErrorCode::fileExists));
  EXPECT_EQ(tree().size(), 2U);
}

}  // namespace
}  // namespace mirabel::testing
