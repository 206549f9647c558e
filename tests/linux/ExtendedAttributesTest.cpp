#include <algorithm>
#include <cerrno>
#include <functional>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "linux/FilesFixture.h"
#include "support/OrdinaryUser.h"

namespace {
// Of the file that was synchronised last, and what to answer that with.
ino_t synchronised = 0;
int syncError = 0;
}  // namespace

/// The program's own, in front of the system's.
extern "C" int fsync(int file) {
  struct stat status {};
  ::fstat(file, &status);
  synchronised = status.st_ino;
  errno = syncError;
  return syncError == 0 ? static_cast<int>(::syscall(SYS_fsync, file)) : -1;
}

namespace mirabel::testing {
namespace {

constexpr std::string_view attribute = "com.norvane.test";

class ExtendedAttributesOnDisk : public FilesTest {
 protected:
  void SetUp() override {
    if (!hasUserAttributes(home.path())) GTEST_SKIP() << "no user attributes on this file system";
    home.writeFile("file");
  }
  Result<Data> read(std::string_view name) {
    return platform().attributes.read(attribute, home.url(name), 64);
  }
};

TEST_F(ExtendedAttributesOnDisk, AreKeptInTheUserNamespaceAndOthersAreNotSeen) {
  const std::string path = home.at("file");
  ASSERT_TRUE((*platform().attributes.open(home.url("file")))->set(attribute, {7, 0, 8}));
  char value[8];
  ASSERT_EQ(::getxattr(path.c_str(), "user.com.norvane.test", value, sizeof(value)), 3);
  EXPECT_EQ(std::string(value, 3), std::string("\x07\0\x08", 3));
  if (OrdinaryUser::isRoot()) {
    ASSERT_EQ(::setxattr(path.c_str(), "trusted.com.norvane.test", "", 0, 0), 0);
  }
  EXPECT_EQ(platform().attributes.names(home.url("file")).value(),
            std::vector<std::string>{std::string(attribute)});
}

TEST_F(ExtendedAttributesOnDisk, ManyNamesAreListedAloneAndTogether) {
  std::vector<std::string> names;
  const auto target = platform().attributes.open(home.url("file")).value();
  for (char c = 'a'; c < 'm'; ++c) {
    // Together more than fits the first buffer, and than some file systems have room for.
    const std::string name(120, c);
    if (!target->set(name, {1})) break;
    names.push_back(name);
  }
  ASSERT_GT(names.size(), 4U);
  EXPECT_THAT(platform().attributes.names(home.url("file")).value(),
              ::testing::UnorderedElementsAreArray(names));
  const URL url = home.url("file");
  ASSERT_TRUE(platform().resources.prefetch({&url, 1}));
  for (const std::string& name : names)
    EXPECT_EQ(url.resources().hasAttribute(name), true);
  EXPECT_EQ(url.resources().hasAttribute("com.norvane.other"), false);
}

TEST_F(ExtendedAttributesOnDisk, AreSynchronisedWhenTheyAreSetAndRemoved) {
  struct stat status {};
  ASSERT_EQ(::stat(home.at("file").c_str(), &status), 0);
  const auto target = platform().attributes.open(home.url("file")).value();
  const std::function<Result<void>()> changes[] = {[&] { return target->set(attribute, {1}); },
                                                   [&] { return target->remove(attribute); }};
  for (const auto& change : changes) {
    synchronised = 0;
    EXPECT_TRUE(change());
    EXPECT_EQ(synchronised, status.st_ino);
  }
  syncError = EIO;
  const auto set = target->set(attribute, {1});
  syncError = 0;
  EXPECT_TRUE(!set && set.error().isPosix(EIO));
}

TEST_F(ExtendedAttributesOnDisk, AValueThatDoesNotFitLeavesTheOldOne) {
  const auto target = platform().attributes.open(home.url("file")).value();
  ASSERT_TRUE(target->set(attribute, {1, 2}));
  EXPECT_FALSE(target->set(attribute, Data(70'000, 1)));
  EXPECT_EQ(read("file").value(), (Data{1, 2}));
}

TEST_F(ExtendedAttributesOnDisk, OnlyFilesAndFoldersHoldAnyAndAFifoDoesNotBlock) {
  home.makeFifo("fifo");
  home.makeSocket("socket");
  home.makeSymlink("broken", "nowhere");
  for (const std::string_view name : {"fifo", "socket", "broken"}) {
    const auto target = platform().attributes.open(home.url(name)).value();
    EXPECT_EQ(failureOf(target->set(attribute, {5})), EPERM) << name;
    EXPECT_EQ(platform().attributes.names(home.url(name)).value(), std::vector<std::string>())
        << name;
    EXPECT_EQ(failureOf(read(name)), ENODATA) << name;
  }
  ASSERT_TRUE((*platform().attributes.open(home.url()))->set(attribute, {5}));
  EXPECT_EQ(read("").value(), Data{5});
}

TEST_F(ExtendedAttributesOnDisk, PermissionsOfTheFileDecide) {
  for (const std::string_view name : {"readOnly", "writeOnly"})
    home.writeFile(name);
  ASSERT_TRUE((*platform().attributes.open(home.url("readOnly")))->set(attribute, {1}));
  closePlatform();
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  home.setMode("readOnly", 0444);
  home.setMode("writeOnly", 0200);

  const OrdinaryUser user;
  const auto readOnly = platform().attributes.open(home.url("readOnly")).value();
  EXPECT_EQ(failureOf(readOnly->set(attribute, {2})), EACCES);
  EXPECT_EQ(failureOf(readOnly->remove(attribute)), EACCES);
  EXPECT_EQ(read("readOnly").value(), Data{1});
  EXPECT_TRUE((*platform().attributes.open(home.url("writeOnly")))->set(attribute, {3}));
  EXPECT_EQ(failureOf(read("writeOnly")), EACCES);
  EXPECT_TRUE(platform().attributes.names(home.url("writeOnly")));
  closePlatform();
}

}  // namespace
}  // namespace mirabel::testing
