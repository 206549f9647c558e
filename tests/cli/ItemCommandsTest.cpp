#include <filesystem>
#include <fstream>
#include <functional>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

/// The commands that change items.
class ItemCommands : public CommandLineFixture {
 protected:
  void SetUp() override {
    for (const char* name : {"folder", "target", "a", "b"})
      home.makeFolder(name);
    home.writeFile("folder/doc.txt", "text");
    std::ofstream(home.path() + "/source.txt") << "imported";
  }

  std::string idOf(std::string_view name) const {
    return done({"id", home.at(name)}).at("itemIdentifier");
  }
  bool exists(std::string_view name) const { return fs::exists(fs::symlink_status(home.at(name))); }

  /// Identifiers that the working set is told of since the anchor, as "updated" or as "deleted".
  std::vector<std::string> toldSince(const std::string& anchor, const char* how) const {
    const auto batch = done({"changes", "--since", anchor, "workingset"});
    std::vector<std::string> told;
    for (const auto& each : batch.at(how))
      told.push_back(each.is_string() ? each : each.at("itemIdentifier"));
    return told;
  }
};

TEST_F(ItemCommands, HandBackTheItemThatAListingShowsAndTheChangesName) {
  const std::vector<std::vector<std::string>> commands = {
      {"mkdir", "new", "--in", home.at("folder")},
      {"import", home.path() + "/source.txt", "--in", home.at("folder")},
      {"rename", home.at("folder/doc.txt"), "letter.txt"},
      {"mv", home.at("folder/letter.txt"), home.at("target"), "--name", "moved.txt"},
      {"tag", home.at("target/moved.txt"), "red", "blue"},
      {"favorite", home.at("target/moved.txt"), "7"},
      {"used", home.at("target/moved.txt"), "2026-11-21"},
      {"trash", home.at("target/moved.txt")},
      {"restore", home.at(".Trash/moved.txt")},
  };
  const std::string document = idOf("folder/doc.txt");
  for (const auto& command : commands) {
    const std::string before = anchor("workingset");
    const nlohmann::json handedBack = done(command);
    EXPECT_EQ(done({"info", handedBack.at("itemIdentifier")}), handedBack) << command[0];
    EXPECT_THAT(toldSince(before, "updated"),
                Contains(handedBack.at("itemIdentifier").get<std::string>()))
        << command[0];
    if (command[0] != "mkdir" && command[0] != "import") {
      EXPECT_EQ(handedBack.at("itemIdentifier"), document) << command[0];
    }
  }
  const nlohmann::json last = done({"info", document});
  EXPECT_EQ(last.at("path"), home.at("target/moved.txt"));
  EXPECT_EQ(last.at("tags"), nlohmann::json({"red", "blue"}));
  EXPECT_EQ(last.at("favoriteRank"), "7");
  EXPECT_EQ(last.at("lastUsedDate"), "2026-11-21T00:00:00Z");

  const std::string before = anchor("workingset");
  EXPECT_EQ(done({"rm", home.at("target/moved.txt")}), nlohmann::json({{"deleted", {document}}}));
  EXPECT_THAT(toldSince(before, "deleted"), Contains(document));
  EXPECT_FALSE(exists("target/moved.txt"));
}

TEST_F(ItemCommands, MetadataIsClearedAndTagsArePrinted) {
  const std::string doc = home.at("folder/doc.txt");
  EXPECT_EQ(run({"tag", doc, "red", "late\nr"}).code, 0);
  EXPECT_EQ(run({"tag", doc}).out, "red\nlate\\nr\n");
  EXPECT_EQ(done({"tag", doc, "a", "b", "a", "A"}).at("tags"), nlohmann::json({"a", "b", "A"}));
  expectFailure(run({"tag", doc, "c", ""}), 2, "a tag can't be empty");
  expectFailure(run({"tag", doc, "\xff"}), 2, "can't use \\xff; a tag is text in UTF-8");
  EXPECT_EQ(run({"tag", doc}).out, "a\nb\nA\n");
  EXPECT_EQ(done({"tag", doc, "--clear"}).at("tags"), nlohmann::json::array());
  EXPECT_EQ(done({"favorite", doc}).at("favoriteRank"), "1");
  EXPECT_EQ(done({"favorite", doc, "2.5"}).at("favoriteRank"), 2.5);
  EXPECT_FALSE(done({"favorite", doc, "--clear"}).contains("favoriteRank"));
  EXPECT_TRUE(done({"used", doc}).contains("lastUsedDate"));
  EXPECT_FALSE(done({"used", doc, "--clear"}).contains("lastUsedDate"));
}

TEST_F(ItemCommands, FailuresSayWhyAndEndWithTheirCode) {
  home.writeFile("target/doc.txt", "in the way");
  home.makeFolder(".Trash");
  const std::string doc = home.at("folder/doc.txt");
  const std::string taker = idOf("target/doc.txt");
  const std::tuple<std::vector<std::string>, int, std::string> rows[] = {
      {{"mkdir", "new", "--in", "root"}, 5, "choose a folder in it"},
      {{"mkdir", "a/b", "--in", home.at("folder")}, 1, "a name can't hold \"/\""},
      {{"mkdir", std::string(256, 'x'), "--in", home.at("folder")}, 1, "file name too long"},
      {{"mkdir", "new", "--in", doc}, 1, "not a folder"},
      {{"mkdir", "new", "--in", home.at("nowhere")}, 3, "no such file"},
      {{"import", home.path() + "/nothing", "--in", home.at("folder")}, 3, "no such file"},
      {{"mkdir", "Inbox", "--in", home.at("target")},
       3,
       "it was done, but under that name it is not shown"},
      {{"rename", "did=999", "name"}, 3, "no item has this identifier"},
      {{"mv", doc, home.at("target")}, 6, "the name is taken by " + taker},
      {{"mv", doc, "root"}, 5, "choose a folder in it"},
      {{"mv", home.at("folder"), home.at("folder")}, 1, "a folder can't be moved into itself"},
      {{"rm", "root"}, 5, "the root itself can't be changed"},
      {{"restore", doc}, 1, "it is not in the trash"},
      {{"trash", home.at(".Trash")}, 5, "it is the trash itself"},
      {{"favorite", doc, "many"}, 2, "a rank is a number"},
      {{"used", doc, "yesterday"}, 2, "a date is written like"},
  };
  for (const auto& [arguments, code, message] : rows)
    expectFailure(run(arguments), code, message);
  EXPECT_EQ(run({"--json", "used", doc, "yesterday"}).error().at("domain"), "usage");
  EXPECT_EQ(run({"tag", doc, "red", "--clear"}).code, 2);
  EXPECT_EQ(run({"mkdir", "new"}).code, 2);
  EXPECT_TRUE(exists("folder/doc.txt"));
  EXPECT_TRUE(exists("target/Inbox"));
}

TEST_F(ItemCommands, OfSeveralItemsOneFailureDoesNotStopTheOthers) {
  std::ofstream(home.path() + "/second.txt") << "2";
  const Answer answer = run({"import", home.path() + "/source.txt", home.path() + "/missing",
                             home.path() + "/second.txt", "--in", home.at("folder")});
  EXPECT_EQ(answer.code, 3);
  EXPECT_TRUE(exists("folder/source.txt") && exists("folder/second.txt"));
  EXPECT_EQ(run({"rm", home.at("nowhere"), home.at("folder/second.txt")}).code, 3);
  EXPECT_FALSE(exists("folder/second.txt"));
}

TEST_F(ItemCommands, ADryRunSaysWhatWouldGoAndLeavesIt) {
  home.writeFile("folder/second.txt", "12345");
  const Answer answer = run({"rm", "--dry-run", home.at("folder")});
  EXPECT_EQ(answer.code, 0);
  EXPECT_THAT(answer.out, HasSubstr("would remove " + idOf("folder")));
  EXPECT_THAT(answer.out, HasSubstr("(3 entries, 9 B)"));
  EXPECT_TRUE(exists("folder/doc.txt"));
}

TEST_F(ItemCommands, ADryRunCountsWhatLiesDeeperThanAPathMayBeLong) {
  std::string chain;
  for (int i = 0; i < 12; ++i)
    chain += "/" + std::string(200, 'd');
  fs::create_directories(home.at("a" + chain));
  fs::create_directories(home.at("b" + chain));
  home.writeFile("b" + chain + "/deep", "12345");
  home.makeSymlink("b/link", home.at("folder"));
  home.rename("b", "a" + chain + "/b");
  EXPECT_THAT(run({"rm", "--dry-run", home.at("a")}).out, HasSubstr("(28 entries, 5 B)"));
}

TEST_F(ItemCommands, OfAFileWithSeveralNamesChangeTheOneThatTheyWereGiven) {
  using Words = std::vector<std::string>;
  const std::pair<Words, const char*> commands[] = {{{"rm", "@"}, nullptr},
                                                    {{"rename", "@", "new"}, nullptr},
                                                    {{"mv", "@", home.at("target")}, "target/"},
                                                    {{"trash", "@"}, ".Trash/"}};
  int round = 0;
  for (const auto& [words, becomes] : commands) {
    // Whichever of them was seen first, and stands before the other in a listing.
    for (const bool isOtherKnown : {false, true}) {
      for (const auto& [folder, otherFolder] : {std::pair("a/", "b/"), {"b/", "a/"}}) {
        const std::string name = "file" + std::to_string(++round);
        const std::string given = folder + name;
        const std::string other = otherFolder + name;
        home.writeFile(given);
        fs::create_hard_link(home.at(given), home.at(other));
        if (isOtherKnown) idOf(other);
        const std::string identifier = idOf(given);
        Words command = words;
        std::ranges::replace(command, "@", home.at(given));
        std::ranges::replace(command, "new", "new" + name);
        const std::string place = words[0] == "rename"
                                      ? folder + command.back()
                                      : (becomes == nullptr ? folder : becomes) + name;
        EXPECT_THAT(run(command).out, HasSubstr(identifier + "  " + home.at(place) + "\n"));
        EXPECT_FALSE(exists(given)) << words[0];
        EXPECT_TRUE(exists(other)) << words[0];
        if (words[0] == "trash") {
          EXPECT_EQ(done({"restore", home.at(place)}).at("path"), home.at(given));
        }
      }
    }
  }
}

// As root, on a file system of three megabytes. The program itself is larger than it, whatever room
// the state gives up.
TEST_F(ItemCommands, OnAFullDiskThingsAreTrashedPutBackAndDeleted) {
  const Answer answer = shell(R"sh(
    mkdir "$home/small" && mount -t tmpfs -o size=3M tmpfs "$home/small" || exit 77
    trap 'umount "$home/small"' EXIT
    mkdir -p "$home/small/Documents/folder/sub" && echo x > "$home/small/Documents/folder/sub/new"
    say() { "$mirabel" --home "$home/small" "$@"; }
    say ls > /dev/null
    dd if=/dev/zero of="$home/small/filler" bs=64k 2>/dev/null
    say import "$mirabel" --in "$home/small/Documents/folder" && exit 1
    say trash "$home/small/Documents/folder/sub/new" || exit 2
    say restore "$home/small/Documents/.Trash/new" || exit 3
    say rm "$home/small/Documents/folder" || exit 4
    find "$home/small/Documents" -mindepth 1 ! -name .Trash)sh");
  if (answer.code == 77) GTEST_SKIP() << "nothing may be mounted here";
  EXPECT_EQ(answer.code, 0) << answer.err;
  EXPECT_THAT(answer.out, ::testing::Not(HasSubstr("/.mirabel-")));
  EXPECT_THAT(answer.out, HasSubstr("removed "));
  EXPECT_THAT(answer.err, HasSubstr("no space left on device"));
}

/// What every user's trash has to stand.
class TrashCommands : public ItemCommands {
 protected:
  std::string trash(std::string_view name) const {
    return done({"trash", home.at(name)}).at("itemIdentifier");
  }
  std::string restore(const std::string& identifier) const {
    return done({"restore", identifier}).at("path");
  }
};

TEST_F(TrashCommands, EverythingComesBackToItsPlaceUnderItsOwnName) {
  home.makeFolder("folder/sub");
  home.writeFile("folder/sub/file", "inside");
  home.makeFolder("folder/letter.quill");
  home.writeFile("folder/letter.quill/text", "page");
  home.makeSymlink("folder/link", "nowhere");
  home.writeFile("folder/" + std::string(255, 'n'), "long");
  home.writeFile("folder/read-only", "r");
  home.setMode("folder/read-only", 0444);
  home.writeFile("top", "in the document storage itself");
  std::vector<std::pair<std::string, std::string>> trashed;
  const std::string names[] = {"folder/sub",  "folder/letter.quill",
                               "folder/link", "folder/" + std::string(255, 'n'),
                               "top",         "folder/read-only"};
  for (const std::string& name : names) {
    trashed.emplace_back(name, trash(name));
    EXPECT_FALSE(exists(name)) << name;
  }
  for (const auto& [name, identifier] : trashed) {
    EXPECT_EQ(restore(identifier), home.at(name));
    EXPECT_TRUE(exists(name)) << name;
  }
  EXPECT_TRUE(exists("folder/sub/file"));
  EXPECT_THAT(done({"ls", home.at(".Trash")}).at("items"), IsEmpty());
}

TEST_F(TrashCommands, ThingsOfOneNameKeepApart) {
  const std::string first = trash("folder/doc.txt");
  home.writeFile("folder/doc.txt", "second");
  const std::string second = trash("folder/doc.txt");
  EXPECT_NE(first, second);
  EXPECT_TRUE(exists(".Trash/doc 2.txt"));
  EXPECT_EQ(restore(second), home.at("folder/doc.txt"));
  // Its name is taken now, and it bounces.
  EXPECT_EQ(restore(first), home.at("folder/doc 2.txt"));
}

TEST_F(TrashCommands, TheFolderThatItCameFromIsFoundWhereverItIsNow) {
  const std::string moved = trash("folder/doc.txt");
  home.rename("folder", "target/elsewhere");
  EXPECT_EQ(restore(moved), home.at("target/elsewhere/doc.txt"));
}

TEST_F(TrashCommands, WhereThatFolderCanTakeNothingTheUserIsAsked) {
  std::vector<std::string> items;
  for (const std::string folder : {"replaced", "trashed", "gone"}) {
    home.makeFolder(folder);
    home.writeFile(folder + "/" + folder, "x");
    items.push_back(trash(folder + "/" + folder));
  }
  home.remove("replaced");
  home.writeFile("replaced", "a file now");
  const std::string folder = trash("trashed");
  home.remove("gone");
  for (const std::string& identifier : items) {
    const Answer refused = run({"restore", identifier});
    EXPECT_EQ(refused.code, 1);
    EXPECT_THAT(refused.err, HasSubstr("say with --to where it shall go"));
    const Answer nowhere = run({"restore", identifier, "--to", folder});
    EXPECT_EQ(nowhere.code, 1);
    EXPECT_THAT(nowhere.err, ::testing::EndsWith("; it is in the trash itself\n"));
    EXPECT_EQ(run({"restore", identifier, "--to", home.at("target")}).code, 0);
  }
  for (const char* file : {"target/replaced", "target/trashed", "target/gone"})
    EXPECT_TRUE(exists(file)) << file;
}

TEST_F(TrashCommands, TwoProcessesThatTrashAndRestoreAtOnceLoseNothing) {
  for (int i = 0; i < 3; ++i)
    home.writeFile("folder/f" + std::to_string(i), std::to_string(i));
  static_cast<void>(shell(R"sh(
    ids=
    for i in 0 1 2; do ids="$ids $("$mirabel" --home "$home" id "$documents/folder/f$i")"; done
    # Each in turn finds the other's doing: trashing what is trashed, restoring what is not, fails.
    work() {
      for round in 1 2 3 4; do
        for id in $ids; do
          "$mirabel" --home "$home" "$1" "$id"
          "$mirabel" --home "$home" "$2" "$id"
        done
      done
    }
    work trash restore & work restore trash & wait)sh"));
  std::vector<std::string> found;
  for (const char* folder : {"folder", ".Trash"}) {
    for (const auto& entry : fs::directory_iterator(home.at(folder)))
      found.push_back(entry.path().filename());
  }
  EXPECT_THAT(found, ::testing::UnorderedElementsAre("f0", "f1", "f2", "doc.txt"));
}

}  // namespace
}  // namespace mirabel::testing
