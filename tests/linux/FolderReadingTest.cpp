#include <sys/resource.h>

#include "linux/FilesFixture.h"

namespace mirabel::testing {
namespace {

class FolderReading : public FilesTest {};

TEST_F(FolderReading, AStreamGoesOnThroughSeveralBuffersWhileTheFolderChanges) {
  constexpr int count = 2000;
  for (int i = 0; i < count; ++i)
    home.writeFile("name-" + std::to_string(i) + std::string(60, 'x'));
  const auto stream = platform().directories.open(home.url()).value();
  int seen = 0;
  while (const auto entry = stream->next()) {
    if (++seen == 5) home.writeFile("late");
  }
  EXPECT_GE(seen, count + 2);
  EXPECT_LE(seen, count + 3);
  EXPECT_EQ(platform().objects.status(home.url()).value().linkCount, count + 1 + 2);
}

TEST_F(FolderReading, SizesCountEachFileOnceAndLinksNot) {
  home.makeFolder("a");
  home.writeFile("a/file", "12345");
  home.link("a/file", "a/same");
  home.makeSymlink("a/link", "/usr");
  home.makeFifo("a/fifo");
  EXPECT_EQ(platform().sizes.directorySize(home.url("a")).value(), 5U);
  EXPECT_EQ(failureOf(platform().sizes.directorySize(home.url("a/file"))), ENOTDIR);
  EXPECT_FALSE(platform().sizes.directorySize(home.url("a/link")));
}

TEST_F(FolderReading, DepthCostsNoDescriptors) {
  std::string path = "d";
  for (int depth = 0; depth < 300; ++depth)
    path += "/d";
  ASSERT_TRUE(platform().operations.createDirectory(home.url(path)));
  home.writeFile(path + "/file", "1234567");
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
  rlimit few = before;
  few.rlim_cur = 64;
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &few), 0);
  const auto size = platform().sizes.directorySize(home.url());
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
  EXPECT_EQ(size.value(), 7U);
}

}  // namespace
}  // namespace mirabel::testing
