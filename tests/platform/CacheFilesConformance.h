#pragma once

#include <cerrno>
#include <cstdint>
#include <gtest/gtest.h>
#include <limits>

#include "platform/ConformanceFixture.h"

namespace mirabel::testing {

TEST_P(PlatformConformance, CacheFileIsReplacedWholeAndReadBack) {
  CacheFiles& caches = platform().caches;
  const URL folder = caches.applicationSupportURL().appendingPathComponent("deep/Mirabel");
  const URL file = folder.appendingPathComponent("a.plist");
  EXPECT_EQ(caches.read(file, 10).value(), std::nullopt);
  EXPECT_EQ(posixCode(caches.replace(file, {1})), ENOENT);
  for (int time = 0; time < 2; ++time)
    ASSERT_TRUE(caches.createDirectory(folder));
  for (const Data& bytes : {Data(70'000, 7), Data{}, Data{0, 255}}) {
    ASSERT_TRUE(caches.replace(file, bytes));
    EXPECT_EQ(caches.read(file, 70'000).value(), bytes);
  }
  EXPECT_EQ(caches.read(file, 2).value(), (Data{0, 255}));
  EXPECT_EQ(posixCode(caches.read(file, 1)), EFBIG);
}

TEST_P(PlatformConformance, ClaimedVersionsOnlyGrow) {
  constexpr std::uint64_t largest = std::numeric_limits<std::uint64_t>::max();
  CacheFiles& caches = platform().caches;
  EXPECT_EQ(caches.claimVersion("a", 0).value(), 1U);
  EXPECT_EQ(caches.claimVersion("a", 1).value(), 2U);
  EXPECT_EQ(caches.claimVersion("a", 0).value(), 3U);
  EXPECT_EQ(caches.claimVersion("b", 0).value(), 1U);
  EXPECT_EQ(caches.claimVersion("a", 1'000).value(), 1'001U);
  EXPECT_EQ(caches.claimVersion("a", 5).value(), 1'002U);
  EXPECT_EQ(posixCode(caches.claimVersion("a", largest)), EOVERFLOW);
  EXPECT_EQ(caches.claimVersion("a", largest - 1).value(), largest);
  EXPECT_EQ(posixCode(caches.claimVersion("a", 0)), EOVERFLOW);
}

}  // namespace mirabel::testing
