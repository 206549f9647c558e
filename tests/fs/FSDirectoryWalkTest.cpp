#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "fs/FSDirectoryWalk.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

constexpr std::uint64_t noEnd = 1'000'000;

class FSDirectoryWalkTest : public ::testing::Test {
 protected:
  FSDirectoryWalkTest() {
    for (const char* file : {"a/1", "a/deep/x", "a/deep/y", "a/2", "b", "p.bundle/in", "c"})
      add(file);
  }
  void add(std::string_view file) {
    fake.volume.makeFolder(fake.url(file).deletingLastPathComponent().path());
    fake.volume.writeFile(fake.path(file));
  }
  FSDirectoryWalk walk(FSDirectoryWalk::Plan plan) {
    return {std::move(plan), fake.platform().directories, fake.platform().resources};
  }
  FSDirectoryWalk walk() { return walk({{fake.url()}, true}); }
  /// The next entries, relative to the documents.
  std::vector<std::string> take(FSDirectoryWalk& walk, std::uint64_t limit = noEnd) {
    std::vector<std::string> seen;
    const auto counted = walk.next(limit, [&](const URL& url) -> Result<void> {
      seen.push_back(url.path().substr(fake.path("").size() + 1));
      return {};
    });
    EXPECT_EQ(counted.value_or(noEnd), seen.size());
    return seen;
  }

  /// The whole walk, each step made by a walk of its own.
  std::vector<std::string> takenUpAnewAfterEach(std::size_t step) {
    std::vector<std::string> seen;
    std::optional<WalkPosition> position;
    for (;;) {
      FSDirectoryWalk part = walk();
      EXPECT_TRUE(!position || part.restore(*position).value());
      const auto names = take(part, step);
      seen.insert(seen.end(), names.begin(), names.end());
      if (names.size() < step) return seen;
      part.pause();
      position = part.position();
      EXPECT_TRUE(position);
      if (!position) return seen;
    }
  }

  FakePlatform fake;
};

TEST_F(FSDirectoryWalkTest, StepsOfAnySizeMakeUpTheWholeWalk) {
  FSDirectoryWalk whole = walk();
  const auto all = take(whole);
  EXPECT_THAT(
      all, ElementsAre("a", "a/1", "a/deep", "a/deep/x", "a/deep/y", "a/2", "b", "p.bundle", "c"));
  for (std::size_t step = 1; step <= all.size(); ++step) {
    FSDirectoryWalk parts = walk();
    std::vector<std::string> seen;
    for (;;) {
      const auto part = take(parts, step);
      seen.insert(seen.end(), part.begin(), part.end());
      if (part.size() < step) break;
      parts.pause();
      ASSERT_TRUE(parts.resume());
    }
    EXPECT_EQ(seen, all) << step;
    EXPECT_EQ(parts.openDirectories(), 0U);
    EXPECT_EQ(takenUpAnewAfterEach(step), all) << step;
  }
}

TEST_F(FSDirectoryWalkTest, GoesOnWithoutReadingAgain) {
  FSDirectoryWalk parts = walk();
  EXPECT_EQ(take(parts, 4).back(), "a/deep/x");
  EXPECT_EQ(parts.openDirectories(), 3U);
  parts.pause();
  // Names before and after where it stands come and go; what it has yet to give stays.
  fake.volume.remove(fake.path("a/1"));
  add("a/deep/z");
  fake.faults.reset();
  ASSERT_TRUE(parts.resume());
  EXPECT_THAT(take(parts), ElementsAre("a/deep/y", "a/2", "b", "p.bundle", "c"));
  EXPECT_EQ(fake.faults.calls(Op::openDirectory), 0U);
}

TEST_F(FSDirectoryWalkTest, PausedWalkNoticesThatAnOpenFolderLiesElsewhere) {
  fake.volume.makeFolder(fake.path("other"));
  const auto renamed = [&](std::string_view from, std::string_view to) {
    FSDirectoryWalk parts = walk();
    while (take(parts, 1).at(0) != "a/deep/x") {
    }
    parts.pause();
    fake.volume.rename(fake.path(from), fake.path(to));
    return parts.resume();
  };
  EXPECT_TRUE(renamed("a/deep/y", "a/deep/z"));
  EXPECT_TRUE(renamed("b", "other/b"));
  EXPECT_FALSE(renamed("a/deep", "other/deep"));
  fake.volume.rename(fake.path("other/deep"), fake.path("a/deep"));
  EXPECT_FALSE(renamed("a", "z"));
  fake.volume.rename(fake.path("z"), fake.path("a"));
  fake.volume.makeFolder(fake.path("other/deep"));
  EXPECT_FALSE(renamed("other/deep", "a/deep"));  // another folder in its place
}

TEST_F(FSDirectoryWalkTest, FoldersThatCannotBeOpenedAreLeftOutWhereThatIsWanted) {
  const Error denied = Error::posix(EACCES);
  const Error exhausted = Error::posix(EMFILE);
  FSDirectoryWalk::Plan plan{{fake.url("missing"), fake.url()}, true};
  plan.leavesOut = [&](const URL&, const Error& error) { return error != exhausted; };
  fake.faults.fail(Op::openDirectory, denied, 4);  // "missing", the documents, "a", "a/deep"
  FSDirectoryWalk parts = walk(plan);
  EXPECT_THAT(take(parts), ElementsAre("a", "a/1", "a/deep", "a/2", "b", "p.bundle", "c"));

  fake.faults.fail(Op::openDirectory, exhausted, 3);
  FSDirectoryWalk failing = walk(plan);
  EXPECT_EQ(failing.next(noEnd, [](const URL&) { return Result<void>{}; }).error(), exhausted);
}

}  // namespace
}  // namespace mirabel::testing
