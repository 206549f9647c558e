#include <algorithm>
#include <filesystem>
#include <set>
#include <sys/xattr.h>

#include "cli/CommandLineFixture.h"
#include "cli/InstalledApps.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;
using json = nlohmann::json;

const std::string draw = "org.example.Draw";
const std::string notes = "org.example.Notes";
const std::string plain = "org.example.Plain";

class Apps : public CommandLineFixture {
 protected:
  void SetUp() override {
    home.writeFile("letter.txt", "Dear Aunt");
    apps.install(draw, "Draw\nName[de]=Zeichnen");
    apps.write(draw, "sketch.txt", "a line");
    // It opens no files, and shows no documents.
    apps.install(plain, "Plain", "Exec=run\n");
    apps.write(plain, "secret.txt", "text");
  }

  static std::vector<std::string> values(const json& items, const char* key) {
    std::vector<std::string> all;
    for (const json& item : items)
      all.push_back(item.at(key));
    return all;
  }
  std::string inDraw(const std::string& name) const { return apps.documents(draw) + "/" + name; }

  const InstalledApps apps{home};
};

TEST_F(Apps, AreListedBesideTheDocumentsAndBelowThem) {
  const json library = done({"apps"});
  EXPECT_EQ(library.at("itemIdentifier"), "#" + draw);
  EXPECT_EQ(library.at("bundleIdentifier"), draw);
  EXPECT_EQ(library.at("filename"), "Draw");
  EXPECT_EQ(library.at("path"), apps.documents(draw));
  apps.install(notes, "Nö");
  EXPECT_EQ(run({"apps"}).out, "#org.example.Draw   Draw  " + apps.documents(draw) +
                                   "\n#org.example.Notes  Nö    " + apps.documents(notes) + "\n");
  fs::create_directory(inDraw("folder"));
  home.makeFolder("workingset");
  const std::pair<std::string, std::set<std::string>> cases[] = {
      {"root", {"Draw", "Nö", "letter.txt", "workingset"}},
      {"workingset", {"Draw", "Nö", "letter.txt", "sketch.txt", "folder", "workingset"}},
      {"alldirs", {"folder", "workingset"}},
      {home.at("workingset"), {}},
      {"#" + draw, {"sketch.txt", "folder"}},
      {apps.documents(draw), {"sketch.txt", "folder"}}};
  for (const auto& [container, names] : cases) {
    const auto listed = values(done({"ls", container}).at("items"), "filename");
    EXPECT_EQ(std::set(listed.begin(), listed.end()), names) << container;
    EXPECT_EQ(listed.size(), names.size()) << container;
  }
  const json status = done({"status"});
  EXPECT_EQ(status.at("appLibraries"), "2");
  EXPECT_EQ(status.at("appLibraryVersion"), "2");
}

TEST_F(Apps, ThatShowNoDocumentsAreNoItems) {
  const std::string secret = apps.documents(plain) + "/secret.txt";
  for (const std::string& item : {"#" + plain, secret, apps.documents(plain)}) {
    for (const char* command : {"info", "ls", "path", "trash"})
      EXPECT_EQ(run({command, item}).code, 3) << command << item;
    EXPECT_EQ(run({"mkdir", "new", "--in", item}).code, 3) << item;
  }
  expectFailure(run({"info", "#" + plain}), 3, "its documents are not shown");
  expectFailure(run({"info", secret}), 3, "nor in the folder of an app library");
  expectFailure(run({"info", inDraw("..")}), 3, "nor in the folder of an app library");
  EXPECT_TRUE(fs::exists(secret));
}

TEST_F(Apps, CannotBeChangedThemselvesAndTheirTrashSaysWhereItsItemsCameFrom) {
  const std::string library = "#" + draw;
  for (const auto& command :
       {std::vector<std::string>{"rename", library, "Other"},
        std::vector<std::string>{"trash", library}, std::vector<std::string>{"rm", library}})
    expectFailure(run(command), 5, "the folder of an app library can't be changed itself");
  EXPECT_EQ(run({"trash", inDraw("sketch.txt")}).code, 0);
  EXPECT_THAT(run({"info", inDraw(".Trash/sketch.txt")}).out,
              HasSubstr("\ncame from     " + inDraw("sketch.txt") + "\n"));
}

TEST_F(Apps, TellWhereTheirDocumentsLie) {
  EXPECT_EQ(run({"container", draw}).out, "#" + draw + "  " + apps.documents(draw) + "\n");
  EXPECT_EQ(done({"container", draw}).at("path"), apps.documents(draw));
  // Whether or not it shows them.
  const Answer hidden = run({"container", plain});
  EXPECT_EQ(hidden.out, "#" + plain + "  " + apps.documents(plain) + "\n");
  EXPECT_THAT(hidden.err, HasSubstr("is no app library"));
  fs::remove_all(apps.documents(plain));
  expectFailure(run({"container", plain}), 3, "has no folder for documents");
  for (const char* bundle :
       {"org.example.None", "", "..", "../..", "#org.example.Draw", "a/b", "*"})
    expectFailure(run({"container", bundle}), 3, "no application has this identifier");
}

TEST_F(Apps, HaveTheirIconsWritten) {
  const std::string icons = home.path() + "/.local/share/icons/hicolor/scalable/apps";
  fs::create_directories(icons);
  std::ofstream(icons + "/drawing.svg")
      << R"(<svg xmlns="http://www.w3.org/2000/svg" width="9" height="9"><rect width="9"/></svg>)";
  apps.install(draw, "Draw", "Icon=drawing\nExec=run %F\nMimeType=text/plain;\n");
  const std::string file = home.path() + "/icon.png";
  std::ofstream(file) << std::string(100'000, 'x');
  EXPECT_EQ(done({"icon", "#" + draw, "-o", file, "--size", "48"}).at("path"), file);
  std::string bytes(24, '\0');
  std::ifstream(file, std::ios::binary).read(bytes.data(), 24);
  // The signature, and width and height in the first chunk.
  EXPECT_EQ(bytes, std::string("\x89PNG\r\n\x1a\n\0\0\0\rIHDR\0\0\0\x30\0\0\0\x30", 24));
  EXPECT_LT(fs::file_size(file), 100'000u) << "nothing is left of what was there";
  EXPECT_EQ(run({"icon", "#" + draw, "-o", "-", "--size", "48"}).out.substr(0, 24), bytes);
  expectFailure(run({"icon", "#" + draw, "-o", "-"}, Output::terminal), 2, "shows no picture");

  fs::remove(file);
  const std::tuple<std::vector<std::string>, int, std::string> refused[] = {
      {{"icon", "root", "-o", file}, 1, "has no icon"},
      {{"icon", "#" + plain, "-o", file}, 3, "not shown"},
      {{"icon", "#" + draw}, 2, "--output"},
      {{"icon", "#" + draw, "-o", file, "--size", "0"}, 2, "--size takes 1 to 4096"},
      {{"icon", "#" + draw, "-o", file, "--size", "4097"}, 2, "--size takes 1 to 4096"},
      {{"icon", "#" + draw, "-o", home.path() + "/none/x"}, 3, "no such file or folder"}};
  for (const auto& [arguments, code, text] : refused)
    expectFailure(run(arguments), code, text);
  EXPECT_FALSE(fs::exists(file));
}

TEST_F(Apps, ThatComeAndGoBetweenRunsAreToldToTheWorkingSetAndStartTheRootOver) {
  const std::string root = anchor("root");
  const std::string folders = anchor("alldirs");
  std::string everything = anchor("workingset");
  apps.install(notes, "Notes");
  apps.write(notes, "note.txt", "text");
  fs::create_directory(apps.documents(notes) + "/folder");

  json batch = done({"changes", "workingset", "--since", everything});
  const auto told = values(batch.at("updated"), "filename");
  EXPECT_THAT(std::set(told.begin(), told.end()),
              UnorderedElementsAre("Draw", "Notes", "note.txt", "folder"));
  const std::string note = done({"id", apps.documents(notes) + "/note.txt"}).at("itemIdentifier");
  expectFailure(run({"changes", "root", "--since", root}), 4, "start over");
  expectFailure(run({"changes", "workingset", "--since", everything}), 4, "start over");
  batch = done({"changes", "alldirs", "--since", folders});
  EXPECT_THAT(values(batch.at("updated"), "filename"), ElementsAre("folder"));

  everything = anchor("workingset");
  apps.remove(notes);
  batch = done({"changes", "workingset", "--since", everything});
  EXPECT_THAT(batch.at("deleted"), ::testing::IsSupersetOf({json("#" + notes), json(note)}));
  EXPECT_EQ(run({"path", note}).code, 3);
  EXPECT_EQ(run({"path", "#" + notes}).code, 3);
  EXPECT_TRUE(fs::exists(apps.documents(notes) + "/note.txt"));
}

TEST_F(Apps, HoldItemsThatChangeLikeAnyOther) {
  const std::string source = home.path() + "/source.txt";
  std::ofstream(source) << "imported";
  const std::vector<std::pair<std::vector<std::string>, std::string>> steps = {
      {{"mkdir", "Old", "--in", "#" + draw}, "Old"},
      {{"import", source, "--in", inDraw("Old")}, "Old/source.txt"},
      {{"mv", inDraw("sketch.txt"), inDraw("Old"), "--name", "first.txt"}, "Old/first.txt"},
      {{"rename", inDraw("Old"), "Older"}, "Older"},
      {{"trash", inDraw("Older/first.txt")}, ".Trash/first.txt"},
      {{"restore", inDraw(".Trash/first.txt")}, "Older/first.txt"},
      {{"mv", home.at("letter.txt"), inDraw("Older")}, "Older/letter.txt"},
      {{"tag", inDraw("Older/letter.txt"), "red"}, "Older/letter.txt"}};
  for (const auto& [arguments, path] : steps) {
    const json item = done(arguments);
    EXPECT_EQ(item.value("path", ""), inDraw(path)) << ::testing::PrintToString(arguments);
    EXPECT_EQ(item.value("vs_appContainerBundleIdentifier", ""), draw) << path;
  }
  const std::string link = home.path() + "/Drawings";
  fs::create_directory_symlink(apps.documents(draw), link);
  EXPECT_EQ(run({"id", link}).out, "#" + draw + "\n");
  EXPECT_EQ(run({"info", link + "/Older/first.txt"}).code, 0);
}

// Between the move and the notes on it, the process may be killed.
TEST_F(Apps, HaveTheirDocumentsPutBackThoughNothingIsNotedOnThem) {
  EXPECT_EQ(run({"mkdir", "Old", "--in", "#" + draw}).code, 0);
  EXPECT_EQ(run({"mv", inDraw("sketch.txt"), inDraw("Old")}).code, 0);
  EXPECT_EQ(run({"trash", inDraw("Old/sketch.txt")}).code, 0);
  for (const char* name : {"user.com.norvane.trash.time#PS", "user.com.norvane.trash.putback#PS"})
    EXPECT_EQ(::removexattr(inDraw(".Trash/sketch.txt").c_str(), name), 0);
  EXPECT_EQ(done({"restore", inDraw(".Trash/sketch.txt")}).value("path", ""),
            inDraw("Old/sketch.txt"));
}

TEST_F(Apps, WhoseListCannotBeKeptAreNotPassedOverInSilence) {
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const std::string data = home.path() + "/.local/share";
  const OrdinaryUser user;
  fs::permissions(data, fs::perms::owner_read | fs::perms::owner_exec);
  const Answer listed = run({"apps"});
  EXPECT_THAT(listed.err, HasSubstr("can't be brought up to date; " + data + "/Mirabel: perm"));
  const Answer doctor = run({"doctor"});
  EXPECT_EQ(doctor.code, 1);
  EXPECT_THAT(doctor.out, HasSubstr("missing  app libraries: the list of them can't be brought "));
  EXPECT_THAT(doctor.out, HasSubstr("(let yourself write to " + data + "/Mirabel"));
  fs::permissions(data, fs::perms::owner_all);
  const Answer mended = run({"apps"});
  EXPECT_THAT(mended.out, HasSubstr("#" + draw));
  EXPECT_EQ(mended.err, "");
}

TEST_F(Apps, ThatAreLeftOutAreSaidWhyOncePerReason) {
  for (int i = 0; i < 5; ++i) {
    const std::string bundle = "org.example.Led" + std::to_string(i);
    apps.install(bundle, "Led");
    fs::remove(apps.documents(bundle));
    fs::create_directory_symlink("/etc", apps.documents(bundle));
  }
  apps.install(".hidden\n", "Bad");
  const Answer doctor = run({"doctor"});
  EXPECT_EQ(doctor.code, 0);
  EXPECT_THAT(doctor.out, HasSubstr("app libraries: 1 application shows its documents\n"));
  EXPECT_THAT(doctor.out, HasSubstr("limited  applications: left out (its documents are reached "
                                    "through a symbolic link): org.example.Led0, "
                                    "org.example.Led1, org.example.Led2, ...\n"));
  EXPECT_THAT(doctor.out, HasSubstr("): .hidden\\n\n"));
  for (const auto& command : {std::vector<std::string>{"info", "#org.example.Led0"},
                              std::vector<std::string>{"container", "org.example.Led0"}}) {
    expectFailure(run(command), 3, "it is left out: its documents are reached through a symbolic");
  }
  EXPECT_THAT(run({"--json", "ls", "workingset"}).out, ::testing::Not(HasSubstr("passwd")));
}

}  // namespace
}  // namespace mirabel::testing
