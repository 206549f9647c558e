#include "cli/CommandLineFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using Status = CommandLineFixture;

TEST_F(Status, TellsHowChangesAreFollowedAndWhatTheHistoryHolds) {
  home.makeFolder("folder");
  home.makeFolder("folder/inner");
  const nlohmann::json before = done({"status"});
  EXPECT_THAT(before.at("watcher").get<std::string>(), MatchesRegex("folderMarks|inotify"));
  EXPECT_EQ(before.at("foldersWatched"), "3");
  EXPECT_GT(std::stoull(before.at("marksAllowed").get<std::string>()), 3u);
  EXPECT_THAT(before.at("stateFolder"), home.stateFolder());
  EXPECT_FALSE(before.contains("refusal"));
  EXPECT_THAT(run({"status"}).out, HasSubstr("events              none yet\n"));

  // It is in step with the disk: what just happened is in the history.
  home.writeFile("folder/inner/doc");
  const nlohmann::json after = done({"status"});
  EXPECT_EQ(after.at("historyUUID"), before.at("historyUUID"));
  EXPECT_EQ(after.at("firstEventID"), "1");
  EXPECT_GT(std::stoull(after.at("lastEventID").get<std::string>()), 0u);
  const std::string rows = run({"status"}).out;
  EXPECT_THAT(rows, HasSubstr("folders watched     3\n"));
  EXPECT_THAT(
      rows, HasSubstr("history             " + after.at("historyUUID").get<std::string>() + "\n"));
  EXPECT_THAT(rows, HasSubstr("events              1 to " +
                              after.at("lastEventID").get<std::string>() + "\n"));
}

TEST_F(Status, CountsFoldersThatCannotBeRead) {
  home.makeFolder("closed");
  home.makeFolder("open");
  home.setMode("closed", 0);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  {
    const OrdinaryUser user;
    EXPECT_EQ(done({"status"}).at("unreadableFolders"), "1");
  }
  home.setMode("closed", 0700);
}

}  // namespace
}  // namespace mirabel::testing
