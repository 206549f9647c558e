#include <filesystem>
#include <fstream>
#include <unistd.h>

#include "cli/CommandLineFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;

class BadInput : public CommandLineFixture {
 protected:
  std::string database() const {
    for (const auto& entry : fs::directory_iterator(home.stateFolder())) {
      return entry.path() / "volume.db";
    }
    return "";
  }
};

TEST_F(BadInput, AHomeThatIsNoneIsRefused) {
  home.makeFolder("inner");
  home.makeFolder("inner/Documents");
  home.writeFile("file");
  const std::pair<std::string, std::string> cases[] = {
      {home.path() + "/missing", "/missing\" cannot be reached: no such file or folder"},
      {home.at("file"), "/file\" is not a folder"},
      {home.at("inner"), "lies below another folder named \"Documents\""},
      {"", "the home folder \"\""}};
  for (const auto& [path, message] : cases) {
    const std::string onThat = "\"$mirabel\" --home '" + path + "' ";
    expectFailure(shell(onThat + "ls"), 1, message);
    const Answer doctor = shell(onThat + "doctor");
    EXPECT_EQ(doctor.code, 1);
    EXPECT_THAT(doctor.out, MatchesRegex("missing  home: .* \\(.*\\)\n"));
    EXPECT_THAT(doctor.out, HasSubstr(message));
  }
  EXPECT_EQ(shell("env -u HOME \"$mirabel\" --home \"$home\" ls").code, 0);
  EXPECT_FALSE(fs::exists(home.at("inner/.local")));
}

TEST_F(BadInput, ADocumentStorageThatIsNoneIsNamed) {
  fs::remove(home.documents());
  expectFailure(run({"ls"}), 3, "/Documents\": no such file or folder");
  fs::create_symlink("nowhere", home.documents());
  expectFailure(run({"info", "root"}), 1, "/Documents\" is a link to nothing");
  EXPECT_FALSE(fs::exists(home.path() + "/nowhere"));
  fs::remove(home.documents());
  fs::remove_all(home.path() + "/.local");
  std::ofstream(home.documents()) << "x";
  expectFailure(run({"ls"}), 1, "/Documents\" is not a folder");
  EXPECT_FALSE(fs::exists(home.stateFolder()));
}

TEST_F(BadInput, ADamagedDatabaseIsSetAsideAndThatIsSaidOnce) {
  home.writeFile("doc");
  EXPECT_EQ(run({"id", home.at("doc")}).code, 0);
  std::ofstream(database()) << "no database at all";
  const Answer first = run({"--json", "id", home.at("doc")});
  EXPECT_EQ(first.code, 0);
  EXPECT_THAT(nlohmann::json::parse(first.err).at("notice").get<std::string>(),
              HasSubstr("set aside as"));
  const Answer second = run({"id", home.at("doc")});
  EXPECT_EQ(second.err, "");
  EXPECT_EQ(second.out, first.json().at("itemIdentifier").get<std::string>() + "\n");
}

TEST_F(BadInput, AStateFolderThatCannotBeWrittenIsNotPermitted) {
  fs::create_directories(home.path() + "/.local/state");
  fs::permissions(home.path() + "/.local/state", fs::perms(0555));
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  expectFailure(run({"ls"}), 5, "/.local/state/mirabel: permission denied");
}

// Mounts are made in a namespace of their own, which ends with the shell.
class Mounted : public BadInput {
 protected:
  void SetUp() override {
    if (std::system("unshare --mount true 2>/dev/null") != 0) GTEST_SKIP() << "may not mount";
    home.writeFile("doc");
  }
  Answer mounted(const std::string& mount, const std::string& script) const {
    return shell(
        "mkdir -p -m 700 \"$state\"; export mirabel home documents state\n"
        "unshare --mount sh -c '" +
        mount + " || exit 99\n" + script + "'");
  }
};

TEST_F(Mounted, AReadOnlyStateIsNotPermitted) {
  ASSERT_EQ(run({"id", home.at("doc")}).code, 0);
  expectFailure(mounted("mount --bind \"$state\" \"$state\" && mount -o remount,bind,ro \"$state\"",
                        "\"$mirabel\" --home \"$home\" path did=1"),
                5, "read-only file system");
}

TEST_F(Mounted, AFullStateDiskFailsAndWorksAgainWhenThereIsRoom) {
  for (int i = 0; i < 3000; ++i)
    home.writeFile("document number " + std::to_string(i));
  const Answer answer = mounted("mount -t tmpfs -o size=64k,mode=700 tmpfs \"$state\"",
                                "\"$mirabel\" --home \"$home\" ls >/dev/null && exit 98\n"
                                "code=$?; mount -o remount,size=64m \"$state\"\n"
                                "\"$mirabel\" --home \"$home\" ls >/dev/null || exit 97\n"
                                "exit $code");
  expectFailure(answer, 1, "no space left on device; make room there");
}

}  // namespace
}  // namespace mirabel::testing
