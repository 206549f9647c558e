#include <filesystem>

#include "linux/FilesFixture.h"

namespace mirabel::testing {
namespace {

class FileOperationsOnDisk : public FilesTest {};

TEST_F(FileOperationsOnDisk, CreateDirectoryTakesNothingButFoldersOnItsWay) {
  home.writeFile("file");
  home.makeFolder("real");
  home.makeSymlink("link", "real");
  home.makeSymlink("broken", "nowhere");
  for (const std::string_view name :
       {"file", "file/new", "link", "link/new", "broken", "broken/new"}) {
    EXPECT_FALSE(platform().operations.createDirectory(home.url(name))) << name;
  }
  EXPECT_TRUE(std::filesystem::is_empty(home.at("real")));
  EXPECT_FALSE(std::filesystem::exists(home.at("nowhere")));
}

TEST_F(FileOperationsOnDisk, CreateDirectoryWorksOutsideTheRootsThroughLinksOfTheUser) {
  home.makeFolder("unused");
  const std::string state = home.path() + "/state";
  std::filesystem::create_directory(state);
  std::filesystem::create_symlink(state, home.path() + "/linked");
  EXPECT_TRUE(platform().operations.createDirectory(URL::fileURL(home.path() + "/linked/a/b")));
  EXPECT_TRUE(std::filesystem::is_directory(state + "/a/b"));
  EXPECT_EQ(failureOf(platform().operations.createDirectory(URL::fileURL("/proc/new/a"))), ENOENT);
}

}  // namespace
}  // namespace mirabel::testing
