#include <algorithm>
#include <array>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits>
#include <set>
#include <thread>
#include <unistd.h>

#include "foundation/LogSectionCounter.h"
#include "foundation/StandardErrorSink.h"
#include "support/LogCapture.h"

namespace mirabel {
namespace {

using ::testing::ElementsAre;
using testing::LogCapture;
using testing::LogLine;

TEST(Log, LinesBelowTheThresholdAreNotEvenBuilt) {
  const LogCapture capture(LogLevel::info);
  bool isBuilt = false;
  const auto build = [&] {
    isBuilt = true;
    return "costly";
  };
  logDebug(build);
  Log::shared().plain(LogLevel::debug, build);
  { const LogSection section("quiet"); }
  EXPECT_FALSE(isBuilt);
  logInfo("heard");
  EXPECT_THAT(capture.lines(), ElementsAre(LogLine{LogLevel::info, "[INFO] heard"}));
}

TEST(StandardErrorSink, WritesEachLineInOneCall) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::pipe2(ends.data(), O_DIRECT), 0) << "a pipe that keeps writes apart";
  std::FILE* const file = ::fdopen(ends[1], "w");
  StandardErrorSink sink(file);
  sink.write(LogLevel::info, "s", "c", "first");
  sink.write(LogLevel::info, "s", "c", "second");
  std::array<char, 64> buffer{};
  EXPECT_EQ(std::string(buffer.data(), ::read(ends[0], buffer.data(), buffer.size())), "first\n");
  EXPECT_EQ(std::string(buffer.data(), ::read(ends[0], buffer.data(), buffer.size())), "second\n");
  ::close(ends[0]);
  std::fclose(file);
}

/// Runs in a process of its own, whose first sections these are.
[[noreturn]] void logFirstSections() {
  const LogCapture capture;
  {
    const LogSection outer("fetching URL for \"fid=5\"");
    const LogSection inner("pacer event");
  }
  const std::vector<LogLine> expected = {{LogLevel::debug, "[DEBUG] ┏0 fetching URL for \"fid=5\""},
                                         {LogLevel::debug, "[DEBUG] ┏1 pacer event"},
                                         {LogLevel::debug, "[DEBUG] ┗1"},
                                         {LogLevel::debug, "[DEBUG] ┗0"}};
  std::_Exit(capture.lines() == expected ? 0 : 1);
}

TEST(LogSectionDeathTest, NumbersStartAtZeroAndInnerSectionsCloseFirst) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logFirstSections(), ::testing::ExitedWithCode(0), "");
}

TEST(LogSectionDeathTest, RunningOutOfNumbersIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  LogSectionCounter nearlyDone(std::numeric_limits<std::uint64_t>::max() - 1);
  EXPECT_EQ(nearlyDone.draw(), std::numeric_limits<std::uint64_t>::max() - 1);
  EXPECT_EXIT((void)nearlyDone.draw(), ::testing::KilledBySignal(SIGABRT), "used up");
}

TEST(LogSection, NumbersAreUniqueAcrossThreads) {
  constexpr std::size_t perThread = 200;
  std::array<std::vector<std::uint64_t>, 4> drawn;
  {
    std::vector<std::jthread> threads;
    for (auto& numbers : drawn) {
      threads.emplace_back([&numbers] {
        for (std::size_t i = 0; i < perThread; ++i)
          numbers.push_back(LogSection("work").number());
      });
    }
  }
  std::set<std::uint64_t> all;
  for (const auto& numbers : drawn) {
    EXPECT_TRUE(std::ranges::is_sorted(numbers));
    all.insert(numbers.begin(), numbers.end());
  }
  EXPECT_EQ(all.size(), drawn.size() * perThread);
}

}  // namespace
}  // namespace mirabel
