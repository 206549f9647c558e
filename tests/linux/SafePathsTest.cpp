#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <linux/btrfs.h>
#include <sys/ioctl.h>

#include "linux/FilesFixture.h"
#include "linux/PrivateMount.h"
#include "mirabel/UniqueFd.h"

namespace mirabel::testing {
namespace {

class SafePaths : public FilesTest {
 protected:
  /// Every way of reaching an object by its URL must be refused.
  void expectOutOfReach(std::string_view folder, std::string_view object) {
    const URL inside = home.url(std::string(folder) + "/" + std::string(object));
    const Platform& p = platform();
    EXPECT_FALSE(p.resources.readValues(inside));
    EXPECT_TRUE(p.resources.prefetch({&inside, 1}));
    EXPECT_FALSE(inside.resources().isFilled());
    EXPECT_FALSE(p.attributes.names(inside));
    EXPECT_FALSE(p.attributes.size("com.norvane.test", inside));
    EXPECT_FALSE(p.attributes.open(inside));
    EXPECT_FALSE(p.objects.open(inside));
    EXPECT_FALSE(p.objects.status(inside));
    EXPECT_FALSE(p.documents.permanentStorageForItemAtURL(inside, Allocation::ifNone));
    EXPECT_FALSE(p.directories.open(home.url(folder)));
    EXPECT_FALSE(p.sizes.directorySize(home.url(folder)));
    EXPECT_FALSE(p.operations.createDirectory(home.url(std::string(folder) + "/made")));
  }
  void expectListedAndNotEntered(std::string_view folder) {
    home.writeFile("beside", "123");
    home.writeFile(std::string(folder) + "/inside", "12345");
    EXPECT_EQ(valuesOf(folder).kind, FileKind::folder);
    EXPECT_TRUE(platform().objects.open(home.url(folder)).value()->attributes());
    EXPECT_EQ(platform().objects.status(home.url(folder)).value().linkCount, 2);
    expectOutOfReach(folder, "inside");
    EXPECT_EQ(platform().sizes.directorySize(home.url()).value(), 3U);
  }
};

TEST_F(SafePaths, ASymlinkSwappedInForAFolderLeadsNowhere) {
  const TempHome other;
  other.writeFile("secret", "12345");
  home.makeFolder("folder");
  home.writeFile("folder/secret");
  ASSERT_EQ(valuesOf("folder/secret").size, 0U);
  const auto stream = platform().directories.open(home.url("folder"));
  ASSERT_TRUE(stream);

  for (const std::string& target : {other.documents(), std::string("..")}) {
    home.remove("folder");
    home.makeSymlink("folder", target);
    expectOutOfReach("folder", "secret");
    EXPECT_EQ(valuesOf("folder").kind, FileKind::symbolicLink);
    EXPECT_EQ(platform().sizes.directorySize(home.url()).value(), 0U);
  }
  EXPECT_FALSE(std::filesystem::exists(other.at("made")));
}

TEST_F(SafePaths, DotDotDoesNotLeaveTheRoot) {
  home.makeFolder("folder");
  const URL outside = URL::fileURL(home.documents() + "/..");
  EXPECT_EQ(failureOf(platform().resources.readValues(outside)), EXDEV);
  EXPECT_FALSE(platform().objects.open(outside));
  EXPECT_FALSE(platform().attributes.open(outside));
  EXPECT_FALSE(platform().directories.open(outside));
  EXPECT_FALSE(platform().operations.createDirectory(home.url("../made")));
  EXPECT_FALSE(std::filesystem::exists(home.path() + "/made"));
  EXPECT_TRUE(platform().resources.readValues(home.url("folder/..")));
}

TEST_F(SafePaths, CreateDirectoryTakesNothingButFoldersOnItsWay) {
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

TEST_F(SafePaths, CreateDirectoryWorksOutsideTheRootsThroughLinksOfTheUser) {
  home.makeFolder("unused");
  const std::string state = home.path() + "/state";
  std::filesystem::create_directory(state);
  std::filesystem::create_symlink(state, home.path() + "/linked");
  EXPECT_TRUE(platform().operations.createDirectory(URL::fileURL(home.path() + "/linked/a/b")));
  EXPECT_TRUE(std::filesystem::is_directory(state + "/a/b"));
  EXPECT_EQ(failureOf(platform().operations.createDirectory(URL::fileURL("/proc/new/a"))), ENOENT);
}

TEST_F(SafePaths, PathsLongerThanTheKernelTakesWorkEverywhere) {
  std::string deep;
  for (int i = 0; i < 40; ++i)
    deep += (i == 0 ? "" : "/") + std::string(200, 'd');
  const URL url = home.url(deep);
  ASSERT_TRUE(platform().operations.createDirectory(url));
  ASSERT_TRUE(platform().operations.createDirectory(url.appendingPathComponent("letter.quill")));

  const URL child = url.appendingPathComponent("letter.quill");
  EXPECT_TRUE(platform().resources.readValues(child).value().isPackage);
  ASSERT_TRUE(platform().resources.prefetch({&child, 1}));
  EXPECT_EQ(child.resources().snapshot()->typeIdentifier, "com.norvane.quillsuite.document");
  const auto object = platform().objects.open(child).value();
  const auto attributes = object->attributes().value();
  EXPECT_NE(attributes.documentID, 0U);
  EXPECT_EQ(platform().objects.pathOfFileID(object->device().value(), attributes.fileID),
            child.path());
  EXPECT_EQ(platform().objects.status(url).value().linkCount, 3);
  EXPECT_TRUE(platform().directories.open(url));
  if (!hasUserAttributes(home.path())) return;
  ASSERT_TRUE((*platform().attributes.open(child))->set("com.norvane.test", {1}));
  EXPECT_EQ(platform().attributes.read("com.norvane.test", child, 1).value(), Data{1});
}

TEST_F(SafePaths, AMountBelowARootIsListedAndNotEntered) {
  home.makeFolder("mounted");
  const PrivateMount mounted(home.at("mounted"));
  if (!mounted.isThere()) GTEST_SKIP() << "mounting is not permitted here";
  expectListedAndNotEntered("mounted");
}

// A subvolume is no mount to the kernel. Its objects bear the numbers of the root's own.
TEST_F(SafePaths, ASubvolumeBelowARootIsListedAndNotEntered) {
  btrfs_ioctl_vol_args arguments{};
  std::string_view("subvolume").copy(arguments.name, BTRFS_PATH_NAME_MAX);
  const UniqueFd documents(::open(home.documents().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (::ioctl(documents.get(), BTRFS_IOC_SUBVOL_CREATE, &arguments) != 0) {
    GTEST_SKIP() << "this file system has no subvolumes";
  }
  home.makeFolder("subvolume/folder");
  home.writeFile("subvolume/folder/inside", "12345");
  expectListedAndNotEntered("subvolume");
  EXPECT_EQ(failureOf(platform().directories.open(home.url("subvolume"))), EXDEV);
  expectOutOfReach("subvolume/folder", "inside");
}

}  // namespace
}  // namespace mirabel::testing
