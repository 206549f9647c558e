#include <filesystem>
#include <set>

#include "cli/CommandLineFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using Answers = CommandLineFixture;

std::set<std::string> keysOf(const nlohmann::json& object) {
  std::set<std::string> keys;
  for (const auto& entry : object.items())
    keys.insert(entry.key());
  return keys;
}

TEST_F(Answers, AreOneValueForPeopleAndOneObjectForPrograms) {
  home.writeFile("doc");
  EXPECT_EQ(run({"id", home.at("doc")}).out, "did=1\n");
  EXPECT_EQ(done({"id", home.at("doc")}), nlohmann::json({{"itemIdentifier", "did=1"}}));
  EXPECT_EQ(run({"path", "did=1"}).out, home.at("doc") + "\n");
  EXPECT_EQ(done({"path", "did=1"}), nlohmann::json({{"path", home.at("doc")}}));
}

TEST_F(Answers, AnItemHasTheKeysOfWhatItHas) {
  home.writeFile("letter.txt", "Dear Aunt");
  home.makeFolder("folder");
  const nlohmann::json document = done({"info", home.at("letter.txt")});
  std::set<std::string> keys = {"capabilities",   "contentModificationDate",
                                "creationDate",   "docID",
                                "documentSize",   "fileID",
                                "filename",       "isTrashed",
                                "itemIdentifier", "parentItemIdentifier",
                                "path",           "typeIdentifier"};
  EXPECT_EQ(keysOf(document), keys);
  EXPECT_EQ(document.at("documentSize"), "9");
  EXPECT_EQ(document.at("isTrashed"), false);
  EXPECT_EQ(document.at("parentItemIdentifier"), "VesselRootContainerItemIdentifier");
  EXPECT_TRUE(document.at("fileID").is_string() && document.at("capabilities").is_string());
  EXPECT_THAT(document.at("creationDate").get<std::string>(),
              MatchesRegex("[0-9]+-[0-9]+-[0-9]+T[0-9:.]+Z"));
  const nlohmann::json folder = done({"info", home.at("folder")});
  keys.erase("docID");
  keys.erase("documentSize");
  keys.insert("childItemCount");
  EXPECT_EQ(keysOf(folder), keys);
  EXPECT_EQ(folder.at("childItemCount"), 0);
  const nlohmann::json page = done({"ls"});
  EXPECT_EQ(page.at("items").size(), 2u);
  for (const nlohmann::json& item : page.at("items")) {
    EXPECT_EQ(item, item.at("filename") == "folder" ? folder : document);
  }
}

TEST_F(Answers, ForPeopleAreRowsWithReadableSizes) {
  home.writeFile("letter.txt", std::string(14'200, 'x'));
  home.makeFolder("folder");
  const std::string info = run({"info", home.at("letter.txt")}).out;
  EXPECT_THAT(info, HasSubstr("size          14.2 kB\n"));
  EXPECT_THAT(info, HasSubstr("identifier    did=1\n"));
  EXPECT_THAT(info, HasSubstr("path          " + home.at("letter.txt") + "\n"));
  const std::string rows = run({"ls"}).out;
  EXPECT_THAT(rows, HasSubstr("     14.2 kB  "));
  EXPECT_THAT(rows, HasSubstr("  folder/\n"));
  EXPECT_THAT(run({"ls"}, Output::terminal).out, HasSubstr("\033[1;34mfolder\033[0m/"));
}

TEST_F(Answers, NamesAreMadeSafeForPeopleAndKeptForPrograms) {
  const std::string escape = "a\n\033[31m";
  const std::string bytes = "caf\xe9";
  home.writeFile(escape);
  home.writeFile(bytes);
  for (const char* command : {"ls", "info"}) {
    const std::string item = *command == 'l' ? "root" : home.at(escape);
    EXPECT_THAT(run({command, item}).out, HasSubstr("a\\n\\x1b[31m"));
  }
  EXPECT_EQ(run({"path", home.at(bytes)}).out, home.at(bytes) + "\n");
  EXPECT_EQ(run({"path", home.at(bytes)}, Output::terminal).out, home.at("caf\\xe9\n"));
  EXPECT_EQ(done({"info", home.at(escape)}).at("filename"), escape);
  const nlohmann::json item = done({"info", home.at(bytes)});
  EXPECT_EQ(item.at("filename"), "caf\xEF\xBF\xBD");
  EXPECT_EQ(item.at("filenameBytes"), "Y2Fm6Q==");
  EXPECT_TRUE(item.contains("pathBytes"));
  const Answer failure = run({"id", home.at("\033[2J")});
  expectFailure(failure, 3, "\\x1b[2J");
}

TEST_F(Answers, TheDoctorNamesEachFindingWithItsHealth) {
  const Answer healthy = run({"doctor"});
  EXPECT_THAT(healthy.out, HasSubstr("ok       documents: " + home.documents() + "\n"));
  EXPECT_THAT(healthy.out, HasSubstr("ok       state: "));
  std::istringstream lines(run({"--json", "doctor"}).out);
  std::set<std::string> subjects;
  for (std::string line; std::getline(lines, line);) {
    const nlohmann::json finding = nlohmann::json::parse(line);
    subjects.insert(finding.at("subject"));
    EXPECT_THAT(finding.at("health").get<std::string>(), MatchesRegex("ok|limited|missing"));
  }
  EXPECT_EQ(subjects, (std::set<std::string>{
                          "home", "documents", "extended attributes", "birth times", "file handles",
                          "volume UUID", "watching", "service", "state", "room", "app libraries"}));
  home.makeFolder("closed");
  home.setMode("closed", 0);
  const std::string data = home.path() + "/.local/share";
  fs::create_directories(data + "/applications");
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  fs::permissions(data + "/applications", fs::perms::none);
  {
    const OrdinaryUser user;
    const Answer closed = run({"doctor"});
    EXPECT_EQ(closed.code, 0) << closed.out;
    EXPECT_THAT(closed.out, HasSubstr("limited  folders: 1 folder can't be read"));
    EXPECT_THAT(closed.out, HasSubstr("limited  applications: " + data + "/applications: "));
    home.setMode("", 0);
    const Answer unread = run({"doctor"});
    EXPECT_EQ(unread.code, 1);
    EXPECT_THAT(unread.out, HasSubstr("missing  documents: " + home.documents() +
                                      ": permission denied; there is nothing to present (let "));
    expectFailure(run({"ls"}), 5, "the document storage \"" + home.documents() + "\": permission");
    home.setMode("", 0700);
  }
  fs::permissions(data + "/applications", fs::perms::owner_all);
  home.setMode("closed", 0700);
  home.remove("");
  const Answer missing = run({"doctor"});
  EXPECT_EQ(missing.code, 1);
  EXPECT_THAT(missing.out, HasSubstr("missing  documents: "));
  EXPECT_THAT(missing.out, HasSubstr("(make the folder"));
}

TEST_F(Answers, TheDemonstrationFindsItsDocumentToTheEnd) {
  const Answer answer = run({"demo"});
  EXPECT_EQ(answer.code, 0) << answer.out << answer.err;
  EXPECT_THAT(answer.out, HasSubstr("  #org.example.Draw  Draw/\n"));
  EXPECT_THAT(answer.out, HasSubstr("/Documents/Recipes/thanks.txt\n"));
  EXPECT_THAT(answer.out, HasSubstr("$ mirabel changes workingset --since"));
  EXPECT_THAT(answer.out, HasSubstr("/Documents/Kitchen/thanks.txt\n"));
  EXPECT_THAT(answer.out, HasSubstr("The home was temporary and is gone."));
}

}  // namespace
}  // namespace mirabel::testing
