#include <filesystem>
#include <sys/xattr.h>

#include "cli/CommandLineFixture.h"
#include "foundation/KeyedArchive.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;

constexpr const char* attribute = "user.com.norvane.trash.time#PS";
constexpr const char* monthAgo = "30d";

class Expire : public CommandLineFixture {
 protected:
  void SetUp() override {
    home.makeFolder(".Trash");
    if (!hasUserAttributes(home.at(".Trash"))) GTEST_SKIP() << "no extended attributes here";
  }

  /// Something that was trashed so many days ago.
  void trashed(const std::string& name, int daysAgo) const {
    if (!fs::exists(home.at(".Trash/" + name))) home.writeFile(".Trash/" + name, "x");
    const Date date{Date::now().seconds - daysAgo * 86'400, 0};
    const Data payload = keyedarchive::archiveDate(date).value();
    ASSERT_EQ(
        ::setxattr(home.at(".Trash/" + name).c_str(), attribute, payload.data(), payload.size(), 0),
        0);
  }
  bool hasDate(const std::string& name) const {
    return ::getxattr(home.at(".Trash/" + name).c_str(), attribute, nullptr, 0) > 0;
  }
  bool isThere(const std::string& name) const { return fs::exists(home.at(".Trash/" + name)); }
};

TEST_F(Expire, WhatIsOldGoesAndTheRestIsCounted) {
  home.makeFolder(".Trash/folder");
  home.writeFile(".Trash/folder/inside", "x");
  trashed("folder", 31);
  trashed("old", 31);
  trashed(".hidden", 31);
  trashed("young", 29);
  home.writeFile(".Trash/undated", "x");
  const Answer dry = run({"expire", "--older-than", monthAgo, "--dry-run"});
  EXPECT_EQ(dry.code, 0) << dry.err;
  EXPECT_THAT(dry.out, HasSubstr(home.at(".Trash/folder") + "  (trashed "));
  EXPECT_THAT(dry.out, HasSubstr("would remove 3 items trashed before "));
  EXPECT_THAT(dry.out, HasSubstr("1 item without a date would be counted from now on"));
  EXPECT_TRUE(isThere("old"));
  EXPECT_FALSE(hasDate("undated"));

  const auto told = done({"expire", "--older-than", monthAgo});
  EXPECT_EQ(told, (nlohmann::json{{"removed", 3}, {"notRemoved", 0}, {"dated", 1}}));
  EXPECT_FALSE(isThere("old"));
  EXPECT_FALSE(isThere("folder"));
  EXPECT_FALSE(isThere(".hidden"));
  EXPECT_TRUE(isThere("young"));
  EXPECT_TRUE(hasDate("undated"));
  EXPECT_THAT(run({"expire", "--older-than", monthAgo}).out, HasSubstr("removed 0 items"));
}

TEST_F(Expire, WhatTheProgramTrashedGoesTooAndItsHardLinkStays) {
  home.writeFile("a");
  home.link("a", "b");
  home.makeSymlink("link", "nowhere");
  EXPECT_EQ(run({"trash", home.at("b"), home.at("link")}).code, 0);
  const auto told = done({"expire", "--older-than", "2100-01-01"});
  EXPECT_EQ(told.at("removed"), 2);
  EXPECT_TRUE(fs::exists(home.at("a")));
  EXPECT_TRUE(fs::is_empty(home.at(".Trash")));
}

TEST_F(Expire, WhatCannotBeRemovedIsNamedAndCounted) {
  home.makeFolder(".Trash/locked");
  home.writeFile(".Trash/locked/inside", "x");
  trashed("locked", 31);
  trashed("old", 31);
  home.setMode(".Trash/locked", 0555);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  const Answer answer = run({"expire", "--older-than", monthAgo});
  EXPECT_EQ(answer.code, 1);
  EXPECT_THAT(answer.out, HasSubstr("removed 1 item trashed"));
  EXPECT_THAT(answer.err, HasSubstr("still in the trash: " + home.at(".Trash/locked")));
  EXPECT_THAT(answer.err, HasSubstr("can't remove 1 item; the log says why"));
  EXPECT_TRUE(isThere("locked/inside"));
  home.setMode(".Trash/locked", 0755);
}

TEST_F(Expire, ATrashThatIsNotThereOrIsALinkIsEmpty) {
  home.remove(".Trash");
  EXPECT_EQ(done({"expire", "--older-than", "0s"}).at("removed"), 0);
  home.makeFolder("elsewhere");
  home.writeFile("elsewhere/kept");
  home.makeSymlink(".Trash", "elsewhere");
  EXPECT_EQ(done({"expire", "--older-than", "0s"}).at("dated"), 0);
  EXPECT_TRUE(fs::exists(home.at("elsewhere/kept")));
}

TEST_F(Expire, ABadAgeIsOneLineAndTouchesNothing) {
  trashed("old", 31);
  expectFailure(run({"expire", "--older-than", "30"}), 2, "an age like 30d");
  EXPECT_EQ(run({"expire"}).code, 2);
  EXPECT_EQ(run({"expire", "--older-than", "-1d"}).code, 2);
  EXPECT_TRUE(isThere("old"));
}

}  // namespace
}  // namespace mirabel::testing
