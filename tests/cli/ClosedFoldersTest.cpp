// A folder that can't be read holds nothing, whatever its mode, and nothing else suffers from it.
// Listings and changes say the same of it. Permissions mean nothing to the administrator, so all of
// this is done as an ordinary user.
#include <optional>
#include <set>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <utility>
#include <vector>

#include "cli/CommandLineFixture.h"
#include "cli/InstalledApps.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr mode_t closedModes[] = {0, 0100, 0200, 0300, 0311, 0400, 0444, 0600, 0644};

class ClosedFoldersCommands : public CommandLineFixture {
 protected:
  void SetUp() override {
    home.makeFolder("folder");
    home.makeFolder("folder/inner");
    home.writeFile("folder/near.txt");
    home.writeFile("folder/inner/deep.txt");
    home.writeFile("other.txt");
    apps.install(draw, "Draw");
    apps.write(draw, "sketch.txt", "a line");
    if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
    user.emplace();
    since = anchor("workingset");
    held = listed();
  }
  void TearDown() override {
    for (const std::string& path : {home.documents(), home.at("folder"), home.path() + "/.var/app",
                                    home.path() + "/.var/app/" + draw, apps.documents(draw)}) {
      setMode(path, 0755);
    }
    user.reset();
  }

  static void setMode(const std::string& path, mode_t mode) {
    ASSERT_EQ(::chmod(path.c_str(), mode), 0) << path;
  }
  static std::vector<nlohmann::json> lines(const Answer& answer) {
    EXPECT_EQ(answer.code, 0) << answer.err;
    std::vector<nlohmann::json> parsed;
    std::istringstream all(answer.out);
    for (std::string line; std::getline(all, line);)
      parsed.push_back(nlohmann::json::parse(line));
    return parsed;
  }
  using Held = std::set<std::string>;  // identifiers
  Held listed() const {
    Held shown;
    for (const auto& page : lines(run({"--json", "ls", "workingset"})))
      for (const auto& item : page.at("items"))
        shown.insert(item.at("itemIdentifier"));
    return shown;
  }
  /// Whoever held what a listing shows, and applies what is told since, holds what one shows now.
  void expectToldInFull() {
    for (const auto& batch : lines(run({"--json", "changes", "workingset", "--since", since}))) {
      for (const auto& item : batch.at("updated"))
        held.insert(item.at("itemIdentifier"));
      for (const auto& identifier : batch.at("deleted"))
        held.erase(identifier);
      since = batch.at("anchor");
    }
    EXPECT_EQ(held, listed());
    const auto again = lines(run({"--json", "changes", "workingset", "--since", since}));
    EXPECT_THAT(again.front().at("updated"), IsEmpty());
    EXPECT_THAT(again.front().at("deleted"), IsEmpty());
  }

  const std::string draw = "org.example.Draw";
  const InstalledApps apps{home};
  std::optional<OrdinaryUser> user;
  std::string since;
  Held held;
};

TEST_F(ClosedFoldersCommands, OneFolderTakesNothingButItsContentsAway) {
  const Held all = held;
  const std::string deep = done({"id", home.at("folder/inner/deep.txt")}).at("itemIdentifier");
  for (const mode_t mode : closedModes) {
    SCOPED_TRACE(mode);
    setMode(home.at("folder"), mode);
    expectToldInFull();
    EXPECT_EQ(held.size(), all.size() - 3);
    EXPECT_FALSE(held.contains(deep));
    EXPECT_EQ(run({"path", deep}).code, 3);
    for (const char* container : {"root", "alldirs"})
      EXPECT_EQ(run({"ls", container}).code, 0) << container;
    EXPECT_EQ(run({"ls", home.at("folder")}).code, 5);
    EXPECT_THAT(run({"search", "deep"}).out, IsEmpty());
    EXPECT_THAT(run({"search", "other"}).out, HasSubstr("other.txt"));
    EXPECT_EQ(done({"status"}).at("unreadableFolders"), "1");
    setMode(home.at("folder"), 0755);
    expectToldInFull();
    EXPECT_EQ(held, all);
    EXPECT_THAT(run({"search", "deep"}).out, HasSubstr("deep.txt"));
  }
}

TEST_F(ClosedFoldersCommands, TheDocumentStorageItselfFailsEveryQuestion) {
  for (const mode_t mode : closedModes) {
    SCOPED_TRACE(mode);
    setMode(home.documents(), mode);
    for (const std::vector<std::string>& command : {std::vector<std::string>{"ls"},
                                                    {"ls", "workingset"},
                                                    {"ls", "alldirs"},
                                                    {"anchor"},
                                                    {"anchor", "workingset"},
                                                    {"changes", "workingset", "--since", since},
                                                    {"search", "other"}}) {
      expectFailure(run(command), 5, home.documents());
    }
    setMode(home.documents(), 0755);
    const Held before = held;
    expectToldInFull();
    EXPECT_EQ(held, before) << "nothing had gone";
  }
}

TEST_F(ClosedFoldersCommands, TheDocumentsOfAnApplicationLeaveWithItUntilTheyOpen) {
  const Held all = held;
  const std::string container = home.path() + "/.var/app/" + draw;
  std::vector<std::pair<std::string, mode_t>> cases;
  for (const mode_t mode : closedModes)
    cases.emplace_back(apps.documents(draw), mode);
  for (const std::string& above : {container, home.path() + "/.var/app"})
    cases.emplace_back(above, 0);
  for (const auto& [path, mode] : cases) {
    SCOPED_TRACE(path + " " + std::to_string(mode));
    setMode(path, mode);
    expectToldInFull();
    EXPECT_EQ(held.size(), all.size() - 2);
    for (int i = 0; i < 3; ++i) {
      EXPECT_THAT(run({"apps"}).out, IsEmpty());
      EXPECT_EQ(listed(), held);
    }
    EXPECT_THAT(run({"doctor"}).out, HasSubstr("can't be reached"));
    setMode(path, 0755);
    expectToldInFull();
    EXPECT_EQ(held, all);
  }
}

}  // namespace
}  // namespace mirabel::testing
