#include <filesystem>
#include <fstream>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
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

struct Loss {
  const char* name;
  void (*make)(const fs::path& state, const fs::path& copy);
};

class ChangesAfterLoss : public Changes, public ::testing::WithParamInterface<Loss> {};

// The anchor is of after the copy, and the history has come further than it when it is used.
TEST_P(ChangesAfterLoss, StartOver) {
  home.writeFile("doc");
  ASSERT_EQ(run({"anchor"}).code, 0);
  const fs::path state = fs::directory_iterator(home.stateFolder())->path();
  const fs::path copy = home.path() + "/copy";
  fs::copy(state, copy);
  home.writeFile("another");
  const std::string anchor = run({"--json", "anchor"}).json().at("anchor");
  EXPECT_EQ(run({"changes", "--since", anchor}).code, 0);
  GetParam().make(state, copy);
  for (int i = 0; i < 5; ++i) {
    home.writeFile("later" + std::to_string(i));
    ASSERT_EQ(run({"anchor"}).code, 0);
  }
  EXPECT_EQ(run({"changes", "--since", anchor}).code, 4);
  const std::string renewed = run({"--json", "anchor"}).json().at("anchor");
  EXPECT_EQ(run({"changes", "--since", renewed}).code, 0);
}

INSTANTIATE_TEST_SUITE_P(Each, ChangesAfterLoss,
                         ::testing::Values(Loss{"OfTheDatabase",
                                                [](const fs::path& state, const fs::path&) {
                                                  fs::remove(state / "volume.db");
                                                }},
                                           Loss{"OfItsLatestState",
                                                [](const fs::path& state, const fs::path& copy) {
                                                  fs::copy_file(
                                                      copy / "volume.db", state / "volume.db",
                                                      fs::copy_options::overwrite_existing);
                                                }},
                                           Loss{"OfTheLatestStateOfAll",
                                                [](const fs::path& state, const fs::path& copy) {
                                                  fs::remove_all(state);
                                                  fs::rename(copy, state);
                                                }},
                                           Loss{"OfOneByte",
                                                [](const fs::path& state, const fs::path&) {
                                                  std::fstream file(state / "volume.db",
                                                                    std::ios::in | std::ios::out |
                                                                        std::ios::binary);
                                                  file.seekg(5000);
                                                  const int byte = file.get();
                                                  file.seekp(5000);
                                                  file.put(static_cast<char>(byte ^ 1));
                                                }}),
                         [](const auto& test) { return test.param.name; });

}  // namespace
}  // namespace mirabel::testing
