#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "fs/FSDirectoryWalk.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

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

TEST_F(FSDirectoryWalkTest, FailuresEndIt) {
  const LogCapture log;
  const Error error = Error::posix(EMFILE);
  const auto failure = [&](const FSDirectoryWalk::Visitor& visitor) {
    FSDirectoryWalk whole = walk();
    return whole.next(noEnd, visitor).error();
  };
  EXPECT_EQ(failure([&](const URL& url) -> Result<void> {
              if (url == fake.url("a/deep/x")) return fail(error);
              return {};
            }),
            error);
  EXPECT_THAT(log.lines(), IsEmpty());
  // Opened as the second is the folder "a"; closed as the first is what lies deepest.
  for (const auto& [op, number] : {std::pair(Op::openDirectory, 2U), {Op::closeDirectory, 1U}}) {
    fake.faults.reset();
    fake.faults.fail(op, error, number);
    EXPECT_EQ(failure([](const URL&) { return Result<void>(); }), error);
  }
  EXPECT_THAT(
      log.lines(),
      ElementsAre(LogLine{LogLevel::debug, "[DEBUG] can't open directory at " + fake.path("a") +
                                               "; " + error.description()},
                  LogLine{LogLevel::debug, "[DEBUG] can't close directory at " +
                                               fake.path("a/deep") + "; " + error.description()}));
}

TEST_F(FSDirectoryWalkTest, WhatCannotBeLookedAtIsListedAndNotEntered) {
  fake.faults.fail(Op::readValues, Error::posix(EIO));
  FSDirectoryWalk whole = walk();
  EXPECT_THAT(take(whole), ElementsAre("a", "b", "p.bundle", "c"));
}

}  // namespace
}  // namespace mirabel::testing
