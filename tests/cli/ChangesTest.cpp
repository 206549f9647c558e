#include <filesystem>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using Changes = CommandLineFixture;

// Each command is a run of its own: what is told was found out after the fact.
TEST_F(Changes, AreWhatHappenedSinceTheAnchorWhileNothingRan) {
  home.writeFile("letter.txt", "Dear Aunt");
  home.writeFile("gone.txt");
  home.writeFile("moved.txt");
  home.makeFolder("folder");
  ASSERT_EQ(run({"ls"}).code, 0);
  const std::string letter = run({"id", home.at("letter.txt")}).out;
  const std::string moved = run({"id", home.at("moved.txt")}).out;
  const std::string anchor = run({"--json", "anchor", "workingset"}).json().at("anchor");

  home.writeFile(".letter.tmp", "Dear Uncle");
  home.rename(".letter.tmp", "letter.txt");
  home.rename("moved.txt", "folder/moved.txt");
  const std::string goneID = run({"--json", "id", home.at("gone.txt")}).json().at("itemIdentifier");
  home.remove("gone.txt");

  const nlohmann::json batch = run({"--json", "changes", "--since", anchor, "workingset"}).json();
  EXPECT_EQ(batch.at("deleted"), nlohmann::json({goneID}));
  EXPECT_EQ(batch.at("moreComing"), false);
  std::string updated;
  for (const nlohmann::json& item : batch.at("updated")) {
    updated += item.at("itemIdentifier").get<std::string>() + "\n";
  }
  EXPECT_THAT(updated, HasSubstr(letter)) << "a save is an update of the same document";
  EXPECT_THAT(updated, HasSubstr(moved));
  const std::string next = batch.at("anchor");
  EXPECT_EQ(run({"--json", "changes", "--since", next, "workingset"}).json().at("updated").size(),
            0u);
  const std::string rows = run({"changes", "--since", anchor, "root"}).out;
  EXPECT_THAT(rows, HasSubstr("deleted  " + goneID + "\n"));
}

TEST_F(Changes, SinceAnAnchorThatCannotBeUsedStartOver) {
  home.writeFile("doc");
  const std::string anchor = run({"--json", "anchor"}).json().at("anchor");
  for (const char* bad : {"garbage", "AAAA", ""}) {
    EXPECT_EQ(run({"changes", "--since", bad}).code, 4) << bad;
  }
  // Another history: the state was deleted since.
  std::filesystem::remove_all(home.stateFolder());
  EXPECT_EQ(run({"changes", "--since", anchor}).code, 4);
  EXPECT_EQ(run({"changes"}).code, 2);
  EXPECT_EQ(run({"anchor", home.at("missing")}).code, 3);
}

}  // namespace
}  // namespace mirabel::testing
