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
    for (const char* file : {"a/1", "a/deep/x", "a/deep/y", "a/2", "b", "p.bundle/in", "c"}) {
      fake.volume.makeFolder(fake.url(file).deletingLastPathComponent().path());
      fake.volume.writeFile(fake.path(file));
    }
  }
  FSDirectoryWalk walk() {
    return {{{fake.url()}, true}, fake.platform().directories, fake.platform().resources};
  }
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

}  // namespace
}  // namespace mirabel::testing
