#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "linux/files/LinuxCacheFiles.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class LinuxCacheFilesTest : public ::testing::Test {
 protected:
  void write(const std::string& name, const std::string& bytes) const {
    std::ofstream(folder + "/" + name, std::ios::binary) << bytes;
  }

  TempHome home;
  const std::string folder = home.documents();
  LinuxCacheFiles caches{URL::fileURL(home.path()), folder};
};

TEST_F(LinuxCacheFilesTest, DamagedVersionIsFollowedByOneThatCountingNeverReached) {
  ASSERT_EQ(caches.claimVersion("main", 41).value(), 42U);
  const std::string damaged[] = {"",     "4",     "\n",     "x\n",
                                 "-1\n", " 42\n", "42\n\n", std::string(5'000, '9') + "\n"};
  std::uint64_t last = 42;
  for (const std::string& bytes : damaged) {
    write("version-main", bytes);
    const std::uint64_t claimed = caches.claimVersion("main", last).value();
    EXPECT_GT(claimed, last) << bytes.substr(0, 10);
    EXPECT_GT(claimed, std::uint64_t{1} << 50) << bytes.substr(0, 10);
    last = claimed;
    EXPECT_EQ(caches.claimVersion("main", 0).value(), ++last);
  }
}

TEST_F(LinuxCacheFilesTest, WhatIsNoFileIsNotRead) {
  home.makeFolder("folder");
  home.writeFile("target", "1");
  home.makeSymlink("link", "target");
  home.makeFifo("fifo");
  const std::pair<const char*, int> cases[] = {
      {"folder", EINVAL}, {"link", ELOOP}, {"fifo", EINVAL}};
  for (const auto& [name, code] : cases)
    EXPECT_TRUE(caches.read(home.url(name), 10).error().isPosix(code)) << name;
}

TEST_F(LinuxCacheFilesTest, RemainsOfACrashAreInNobodysWay) {
  home.writeFile("target", "untouched");
  home.makeSymlink("a.plist.new", "target");
  ASSERT_TRUE(caches.replace(home.url("a.plist"), {1, 2}));
  EXPECT_EQ(caches.read(home.url("a.plist"), 10).value(), (Data{1, 2}));
  EXPECT_EQ(caches.read(home.url("target"), 10).value(), dataFromString("untouched"));
  EXPECT_FALSE(std::filesystem::exists(home.at("a.plist.new")));
}

TEST_F(LinuxCacheFilesTest, TwoWhoClaimAtOnceNeverGetTheSame) {
  constexpr std::size_t claims = 50;
  std::vector<std::uint64_t> claimed[2];
  {
    std::vector<std::jthread> threads;
    for (auto& mine : claimed) {
      threads.emplace_back([&] {
        LinuxCacheFiles own(URL::fileURL(home.path()), folder);
        for (std::size_t i = 0; i < claims; ++i)
          mine.push_back(own.claimVersion("main", 0).value_or(0));
      });
    }
  }
  std::set<std::uint64_t> all(claimed[0].begin(), claimed[0].end());
  all.insert(claimed[1].begin(), claimed[1].end());
  EXPECT_EQ(all.size(), 2 * claims);
  EXPECT_EQ(*all.begin(), 1U);
  EXPECT_EQ(*all.rbegin(), 2 * claims);
}

}  // namespace
}  // namespace mirabel::testing
