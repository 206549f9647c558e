#include <cerrno>
#include <filesystem>
#include <sys/stat.h>
#include <sys/xattr.h>

#include "foundation/ExtendedAttributes.h"
#include "linux/operations/OperationsFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

constexpr std::string_view trashTime = "com.norvane.trash.time#PS";
constexpr std::string_view putBack = "com.norvane.trash.putback#PS";
constexpr std::string_view rank = "com.norvane.favorite-rank.number#PS";

/// What a file can't hold itself, as the trash needs it.
class KeptAttributes : public OperationsTest {
 protected:
  std::optional<Error> set(std::string_view item, std::string_view name,
                           const std::optional<Data>& payload) {
    return operations().vs_withReadWriteAccess(home.url(item), [&](AttributeTarget& target) {
      return setExtendedAttribute(target, payload, name);
    });
  }

  std::optional<Data> get(std::string_view item, std::string_view name) {
    return extendedAttribute(opened().platform().attributes, name, home.url(item));
  }

  const Data value{1, 2, 3};
};

TEST_F(KeptAttributes, OfALinkAndASpecialFileLastThroughRenamesAndRestartsUntilTheyAreRemoved) {
  home.makeSymlink("link", "nowhere");
  home.makeFifo("fifo");
  for (const std::string name : {"link", "fifo"}) {
    EXPECT_EQ(set(name, trashTime, value), std::nullopt) << name;
    EXPECT_EQ(set(name, putBack, Data{}), std::nullopt) << name;
    ASSERT_TRUE(trash(name)) << name;
    close();
    EXPECT_EQ(get(".Trash/" + name, trashTime), value) << name;
    EXPECT_EQ(get(".Trash/" + name, putBack), Data{}) << name;
    EXPECT_EQ(set(".Trash/" + name, trashTime, std::nullopt), std::nullopt) << name;
    EXPECT_EQ(get(".Trash/" + name, trashTime), std::nullopt) << name;
    // The ordinary attributes fail there in the ordinary way.
    EXPECT_TRUE(set(".Trash/" + name, rank, value).value().isPosix(EPERM)) << name;
  }
}

TEST_F(KeptAttributes, OfAFileThatMayNotBeWrittenLeaveTheFileAsItIs) {
  home.writeFile("file", "x");
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  if (!hasUserAttributes(home.documents())) GTEST_SKIP() << "no user attributes here";
  // Written while that could be done, and to be removed when it can't.
  EXPECT_EQ(set("file", trashTime, value), std::nullopt);
  home.setMode("file", 0444);
  EXPECT_EQ(set("file", trashTime, std::nullopt), std::nullopt);
  EXPECT_EQ(get("file", trashTime), std::nullopt);
  EXPECT_EQ(set("file", putBack, value), std::nullopt);
  close();
  EXPECT_EQ(get("file", trashTime), std::nullopt);
  EXPECT_EQ(get("file", putBack), value);
  EXPECT_TRUE(set("file", rank, value));
  struct stat status {};
  ASSERT_EQ(::stat(home.at("file").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0444U);
  EXPECT_LT(::getxattr(home.at("file").c_str(), "user.com.norvane.trash.putback#PS", nullptr, 0),
            0);

  // Once the file takes it again, it speaks for itself.
  home.setMode("file", 0644);
  EXPECT_EQ(set("file", trashTime, Data{9}), std::nullopt);
  EXPECT_EQ(get("file", trashTime), Data{9});
  home.setMode("file", 0444);
  EXPECT_EQ(get("file", trashTime), Data{9});
}

TEST_F(KeptAttributes, GoWithTheirObjectAndNotWithTheNextOneOfItsName) {
  home.makeSymlink("link", "a");
  EXPECT_EQ(set("link", trashTime, value), std::nullopt);
  home.remove("link");
  home.makeSymlink("link", "b");
  EXPECT_EQ(get("link", trashTime), std::nullopt);
}

}  // namespace
}  // namespace mirabel::testing
