#include <gtest/gtest.h>

#include "enumeration/OpenWalks.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

class OpenWalksTest : public ::testing::Test {
 protected:
  /// A walk that stands that many folders deep.
  std::unique_ptr<FSDirectoryWalk> walkOfDepth(std::size_t depth) {
    std::string path = fake.path("deep");
    for (std::size_t i = 0; i < depth; ++i)
      path += "/d";
    fake.volume.makeFolder(path);
    auto walk =
        std::make_unique<FSDirectoryWalk>(FSDirectoryWalk::Plan{{fake.url("deep")}, true},
                                          fake.platform().directories, fake.platform().resources);
    EXPECT_EQ(walk->next(depth, [](const URL&) { return Result<void>{}; }).value(), depth);
    EXPECT_EQ(walk->openDirectories(), depth);
    return walk;
  }
  static Data cursor(std::size_t n) { return {static_cast<std::uint8_t>(n)}; }

  bool keep(std::size_t n, std::unique_ptr<FSDirectoryWalk> walk, const Data& position = {}) {
    return walks.keep("a", cursor(n), std::move(walk), position);
  }

  FakePlatform fake;
  OpenWalks walks;
};

TEST_F(OpenWalksTest, WalkIsHandedOutOnceUnderItsContainerAndCursor) {
  EXPECT_TRUE(keep(1, walkOfDepth(1)));
  EXPECT_EQ(walks.take("b", cursor(1)), nullptr);
  EXPECT_EQ(walks.take("a", cursor(2)), nullptr);
  EXPECT_NE(walks.take("a", cursor(1)), nullptr);
  EXPECT_EQ(walks.take("a", cursor(1)), nullptr);
}

TEST_F(OpenWalksTest, OldestGoWhenThereAreTooMany) {
  for (std::size_t n = 0; n <= OpenWalks::mostWalks; ++n)
    EXPECT_TRUE(keep(n, walkOfDepth(1)));
  EXPECT_EQ(walks.take("a", cursor(0)), nullptr);
  for (std::size_t n = 1; n <= OpenWalks::mostWalks; ++n)
    EXPECT_NE(walks.take("a", cursor(n)), nullptr) << n;
}

TEST_F(OpenWalksTest, DirectoriesThatStandOpenAreBounded) {
  const std::size_t half = OpenWalks::mostDirectories / 2;
  for (std::size_t n = 0; n < 3; ++n)
    EXPECT_TRUE(keep(n, walkOfDepth(half)));
  EXPECT_EQ(walks.take("a", cursor(0)), nullptr);
  EXPECT_NE(walks.take("a", cursor(1)), nullptr);
  EXPECT_NE(walks.take("a", cursor(2)), nullptr);
  EXPECT_TRUE(keep(3, walkOfDepth(1)));
  EXPECT_TRUE(keep(4, walkOfDepth(OpenWalks::mostDirectories + 1)));
  EXPECT_EQ(walks.take("a", cursor(3)), nullptr);
  EXPECT_EQ(walks.take("a", cursor(4)), nullptr);
}

TEST_F(OpenWalksTest, WalksAtDifferentPlacesUnderOneCursorAreNotMixedUp) {
  const Data here{1};
  const Data there{2};
  EXPECT_TRUE(keep(1, walkOfDepth(1), here));
  EXPECT_TRUE(keep(1, walkOfDepth(1), here));
  EXPECT_NE(walks.take("a", cursor(1)), nullptr);
  EXPECT_FALSE(keep(1, walkOfDepth(1), there));
  EXPECT_FALSE(keep(1, walkOfDepth(1), there));
  EXPECT_EQ(walks.take("a", cursor(1)), nullptr);
  // Where it can't be told, they may be.
  EXPECT_TRUE(keep(2, walkOfDepth(1)));
  EXPECT_FALSE(keep(2, walkOfDepth(1)));
  EXPECT_EQ(walks.take("a", cursor(2)), nullptr);
}

}  // namespace
}  // namespace mirabel::testing
