#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "fs/FSDirectoryEnumerator.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::uint64_t noLimit = 1'000'000;

class FSDirectoryEnumeratorTest : public ::testing::Test {
 protected:
  /// a/{1,2/{x},3} b p.bundle/{inside} .hidden/{h} c
  void makeTree() {
    for (const char* folder : {"a", "a/2", "p.bundle", ".hidden"}) {
      fake.volume.makeFolder(fake.path(folder));
    }
    for (const char* file : {"b", "a/1", "a/2/x", "a/3", "p.bundle/inside", ".hidden/h", "c"}) {
      fake.volume.writeFile(fake.path(file));
    }
  }

  Result<std::uint64_t> walk(const FSDirectoryEnumerator& walker) {
    seen.clear();
    return walker.enumerate(fake.platform().directories, fake.platform().resources,
                            [&](const URL& url) -> Result<void> {
                              seen.push_back(url.path().substr(fake.path("").size() + 1));
                              if (seen.back() == failsAt) return fail(visitorError);
                              return {};
                            });
  }
  FSDirectoryEnumerator walker(bool recursively, std::uint64_t offset = 0,
                               std::uint64_t limit = noLimit) {
    return {{fake.url()}, recursively, offset, limit, {}};
  }

  FakePlatform fake;
  LogCapture log;
  std::vector<std::string> seen;
  std::string failsAt = "-";
  const Error visitorError = Error::posix(ECANCELED);
};

TEST_F(FSDirectoryEnumeratorTest, OptionsDecideWhatIsSeenAndEntered) {
  makeTree();
  EXPECT_EQ(walk(walker(false)).value(), 4U);
  EXPECT_THAT(seen, ElementsAre("a", "p.bundle", "b", "c"));
  EXPECT_EQ(walk(walker(true)).value(), 8U);
  EXPECT_THAT(seen, ElementsAre("a", "a/2", "a/2/x", "a/1", "a/3", "p.bundle", "b", "c"));

  auto custom = walker(false);
  using Options = EnumeratorOptions;
  const std::pair<Options, std::vector<std::string>> cases[] = {
      {Options{}, {"a", "p.bundle", "p.bundle/inside", ".hidden", ".hidden/h", "b", "c"}},
      {Options::skipsPackageDescendants, {"a", "p.bundle", ".hidden", ".hidden/h", "b", "c"}},
      {Options::skipsSubdirectoryDescendants,
       {"a", "p.bundle", "p.bundle/inside", ".hidden", "b", "c"}},
  };
  for (const auto& [options, expected] : cases) {
    // The one folder that keeps its default has its contents left out.
    const auto only = options;
    custom.directoryEnumerationOptionsFor = [only](const URL& url) -> std::optional<Options> {
      if (url.lastPathComponent() == "2") return std::nullopt;
      return only;
    };
    fake.volume.at(fake.path("a")).entries.clear();
    ASSERT_TRUE(walk(custom));
    EXPECT_EQ(seen, expected);
  }
}

TEST_F(FSDirectoryEnumeratorTest, FailuresEndTheWalk) {
  makeTree();
  failsAt = "a/2/x";
  EXPECT_EQ(walk(walker(true)).error(), visitorError);
  EXPECT_EQ(seen.back(), "a/2/x");
  EXPECT_THAT(log.lines(), IsEmpty());
  failsAt = "-";

  const std::pair<Op, std::string> cases[] = {{Op::openDirectory, "open"},
                                              {Op::closeDirectory, "close"}};
  for (const auto& [op, verb] : cases) {
    log.clear();
    const Error error = Error::posix(EMFILE);
    // Opened as the second is the folder "a"; closed as the first is what lies deepest.
    fake.faults.reset();
    fake.faults.fail(op, error, op == Op::openDirectory ? 2 : 1);
    EXPECT_EQ(walk(walker(true)).error(), error);
    EXPECT_THAT(log.lines(),
                ElementsAre(LogLine{LogLevel::debug, "[DEBUG] can't " + verb + " directory at " +
                                                         fake.path(verb == "open" ? "a" : "a/2") +
                                                         "; " + error.description()}));
  }
}

TEST_F(FSDirectoryEnumeratorTest, WhatCannotBeLookedAtIsListedAndNotEntered) {
  makeTree();
  fake.faults.fail(Op::readValues, Error::posix(EIO));
  EXPECT_EQ(walk(walker(true)).value(), 4U);
  EXPECT_THAT(seen, ElementsAre("a", "p.bundle", "b", "c"));
  EXPECT_THAT(log.lines(), IsEmpty());
}

}  // namespace
}  // namespace mirabel::testing
