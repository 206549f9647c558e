#include <chrono>
#include <filesystem>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <regex>
#include <sstream>

#include "cli/CommandLine.h"
#include "cli/InstalledApps.h"
#include "host/bus/ServiceFixture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using Words = std::vector<std::string>;

const std::string longName(255, 'n');
const std::string noUTF8 = "caf\xe9";
const std::string lines = "two\nlines\t\033[31m";
const std::string noCharacter = "\xef\xb7\xa5";  // UTF-8, but no text for the bus
const std::string notUTF8 = "\xff\xfe";

/// The order of what is of one moment would be another in each home.
void writeFile(const TempHome& home, const std::string& name, const std::string& text, int hours) {
  home.writeFile(name, text);
  fs::last_write_time(home.at(name), fs::file_time_type::clock::now() - std::chrono::hours(hours));
}

void prepare(const TempHome& home) {
  for (const char* folder : {"folder", "target", "many", "a", "b"})
    home.makeFolder(folder);
  writeFile(home, "letter.txt", "Dear Aunt", 1);
  writeFile(home, noUTF8, "bytes", 2);
  writeFile(home, lines, "lines", 3);
  writeFile(home, longName, "long", 4);
  writeFile(home, "folder/inside.txt", "in it", 5);
  for (int i = 0; i < 230; ++i)
    writeFile(home, "many/" + std::to_string(i), "", 6 + i);
  home.makeSymlink("link", "letter.txt");
  home.makeFifo("fifo");
  for (const std::string name : {"a/linked", "b/linked", "b/linked too"}) {
    if (name == "a/linked") writeFile(home, name, "linked", 6);
    if (name != "a/linked") fs::create_hard_link(home.at("a/linked"), home.at(name));
  }
  fs::create_directory(home.path() + "/outside");
  std::ofstream(home.path() + "/outside/new.txt") << "new";
  std::ofstream(home.path() + "/outside/" + noUTF8) << "bytes from outside";
  const InstalledApps apps(home);
  apps.install("org.example.Draw", "Draw");
  apps.write("org.example.Draw", "sketch.txt", "a line");
  apps.install("org.example.Plain", "Plain", "Exec=run\n");
}

/// A home with one way of asking for its documents. What differs from home to home by nature is
/// told by the order in which it came up.
class Side {
 public:
  Side(const TempHome& home, Words options) : home_(home), options_(std::move(options)) {
    prepare(home);
  }

  struct Answer {
    int code = 0;
    std::string out;
    std::string err;
    friend bool operator==(const Answer&, const Answer&) = default;
    friend void PrintTo(const Answer& answer, std::ostream* to) {
      *to << "code " << answer.code << "\nout: " << answer.out << "\nerr: " << answer.err;
    }
  };

  /// In the words, "@" stands for the folder of documents, "~" for the home, and "$" for the last
  /// identifier, anchor or page that was printed as an answer of its own.
  Answer run(const Words& words) {
    Words arguments = {"--home", home_.path(), "--timeout", "5"};
    arguments.insert(arguments.end(), options_.begin(), options_.end());
    for (std::string word : words) {
      if (word.starts_with('@')) word.replace(0, 1, home_.documents());
      if (word.starts_with('~')) word.replace(0, 1, home_.path());
      arguments.push_back(word == "$" ? kept_ : std::move(word));
    }
    std::ostringstream out;
    std::ostringstream err;
    const int code = runCommandLine(arguments, {out, err});
    if (code == 0) keep(out.str(), err.str());
    return {code, masked(out.str()), masked(err.str())};
  }

 private:
  void keep(const std::string& out, const std::string& err) {
    std::smatch found;
    static const std::regex anchor("^([A-Za-z0-9+/]{20,}=*|[df]id=\\d+)\n$");
    static const std::regex named(
        "^\\{\"(?:anchor|itemIdentifier)\":\"([^\"]+)\"\\}|\"nextPage\":\"([^\"]+)\"");
    static const std::regex noted("--page (\\S+)");
    if (std::regex_search(out, found, anchor) || std::regex_search(out, found, named) ||
        std::regex_search(err, found, noted))
      kept_ = found[1].matched ? found[1] : found[2];
  }

  std::string masked(std::string text) {
    for (std::size_t at = 0; (at = text.find(home_.path(), at)) != std::string::npos;)
      text.replace(at, home_.path().size(), "HOME");
    static const std::regex own(
        "did=\\d+|fid=\\d+|\"(?:file|doc)ID\":\"\\d+\"|(?:file|document) ID +\\d+"
        "|[A-Za-z0-9+/]{40,}=*");
    static const std::regex made(
        "[0-9A-F]{8}(?:-[0-9A-F]{4}){3}-[0-9A-F]{12}|20[2-9]\\d-\\d\\d-\\d\\d[T ][\\d:.]+Z?");
    static const std::regex events("(events +|EventID\":\")\\d+( to \\d+)?");
    std::string result;
    auto rest = text.cbegin();
    for (std::sregex_iterator it(text.begin(), text.end(), own), end; it != end; ++it) {
      result.append(rest, (*it)[0].first);
      const auto number = numbers_.try_emplace(it->str(), numbers_.size()).first->second;
      result += it->str().substr(0, 4) + "#" + std::to_string(number);
      rest = (*it)[0].second;
    }
    result.append(rest, text.cend());
    return std::regex_replace(std::regex_replace(result, made, "MADE"), events, "EVENTS");
  }

  const TempHome& home_;
  const Words options_;
  std::string kept_;
  std::map<std::string, std::size_t> numbers_;
};

class SameAnswers : public ServiceFixture, public ::testing::WithParamInterface<bool> {
 protected:
  Words options(Words more) const {
    if (GetParam()) more.emplace_back("--json");
    return more;
  }
};

// In this order: what one does shows in those that follow.
const Words commands[] = {
    {"status"},
    // Lookups, of everything that can be named.
    {"info", "@/letter.txt"},
    {"info", "@/folder"},
    {"info", "@/" + noUTF8},
    {"info", "@/" + lines},
    {"info", "@/" + longName},
    {"info", "@/link"},
    {"info", "@/fifo"},
    {"info", "@"},
    {"info", "root"},
    {"info", "#org.example.Draw"},
    {"info", "#org.example.Plain"},
    {"info", "#"},
    {"info", "#" + notUTF8},
    {"info", "#" + std::string(1000, 'x')},
    {"info", "did=99999"},
    {"info", "fid=99999999999999999999"},
    {"info", "@/missing"},
    {"info", "@/" + notUTF8},
    {"info", "@/letter.txt/below"},
    {"info", "@/" + longName + "n"},
    {"info", "~/outside"},
    {"info", "~/.var/app/org.example.Draw/Documents/sketch.txt"},
    {"id", "@/" + noUTF8},
    {"path", "$"},
    {"id", "@/folder"},
    {"path", "$"},
    {"info", "$"},
    {"id", "~/outside/new.txt"},
    {"id", "@/.Trash"},
    {"path", "VesselWorkingSetContainerItemIdentifier"},
    {"path", "did=0"},
    // Listings.
    {"ls"},
    {"ls", "@"},
    {"ls", "workingset"},
    {"ls", "alldirs"},
    {"ls", "@/folder"},
    {"ls", "#org.example.Draw"},
    {"ls", "#org.example.Plain"},
    {"ls", "#" + notUTF8},
    {"ls", "@/letter.txt"},
    {"ls", "@/link"},
    {"ls", "@/missing"},
    {"ls", "@/many", "--pages", "1"},
    {"ls", "@/many", "--page", "$"},
    {"ls", "@/folder", "--page", "$"},
    {"ls", "@/many", "--page", ""},
    {"ls", "@/many", "--page", "AAAA"},
    {"ls", "@/many", "--page", "not base64"},
    {"ls", "@/letter.txt", "--page", "not base64"},
    {"ls", "@/letter.txt", "--pages", "0"},
    {"ls", "--pages", "0"},
    // Anchors, and changes since them.
    {"anchor", "@/folder"},
    {"changes", "--since", "$", "@/folder"},
    {"changes", "--since", "", "root"},
    {"changes", "--since", "AAAA", "root"},
    {"changes", "--since", "not base64"},
    {"changes", "--since", "not base64", "@/letter.txt"},
    {"anchor", "@/letter.txt"},
    {"anchor", "did=99999"},
    {"anchor", "alldirs"},
    {"anchor", "workingset"},
    // What changes the disk.
    {"mkdir", "new", "--in", "root"},
    {"mkdir", "new", "--in", "root"},
    {"mkdir", noUTF8, "--in", "@/folder"},
    {"mkdir", lines, "--in", "@/folder"},
    {"mkdir", noCharacter, "--in", "@/folder"},
    {"rename", "@/folder/" + noCharacter, noCharacter + "2"},
    {"ls", "@/folder"},
    {"mkdir", longName, "--in", "@/folder"},
    {"mkdir", longName + "n", "--in", "@/folder"},
    {"mkdir", "", "--in", "@/folder"},
    {"mkdir", ".", "--in", "@/folder"},
    {"mkdir", "..", "--in", "@/folder"},
    {"mkdir", "a/b", "--in", "@/folder"},
    {"mkdir", "in a file", "--in", "@/letter.txt"},
    {"mkdir", "nowhere", "--in", "did=99999"},
    {"mkdir", "in an app", "--in", "#org.example.Draw"},
    {"mkdir", "hidden", "--in", "#org.example.Plain"},
    {"import", "~/outside/new.txt", "~/outside/" + noUTF8, "~/missing", "--in", "@/folder"},
    {"import", "~/outside/new.txt", "--in", "@/folder"},
    {"import", "~/outside", "--in", "root"},
    {"import", "@/fifo", "--in", "@/folder"},
    {"import", "@/folder", "--in", "@/folder"},
    {"import", "", "--in", "@/folder"},
    {"import", "~/outside/new.txt", "--in", "@/missing"},
    {"changes", "--since", "$", "workingset"},
    {"rename", "@/letter.txt", "note.txt"},
    {"rename", "@/note.txt", noUTF8},
    {"rename", "@/note.txt", "note.txt"},
    {"rename", "@/note.txt", "x/y"},
    {"rename", "@/note.txt", longName + "n"},
    {"rename", "@/note.txt", noUTF8 + noUTF8},
    {"rename", "@/" + noUTF8 + noUTF8, "note.txt"},
    {"rename", "root", "other"},
    {"rename", "#org.example.Draw", "other"},
    {"rename", "@/missing", "other"},
    {"mv", "@/note.txt", "@/folder"},
    {"mv", "@/folder/note.txt", "root", "--name", "new"},
    {"mv", "@/folder/note.txt", "root", "--name", noUTF8 + "2"},
    {"mv", "@/" + noUTF8 + "2", "@/target", "--name", "note.txt"},
    {"mv", "@/target/note.txt", "@/missing"},
    {"mv", "@/target/note.txt", "@/link"},
    {"mv", "@/target", "@/target"},
    {"mv", "root", "@/target"},
    {"mv", "@/target/note.txt", "#org.example.Draw"},
    {"mv", "~/.var/app/org.example.Draw/Documents/note.txt", "@/target"},
    // Metadata.
    {"tag", "@/target/note.txt", "Red", "Gr\u00fcn"},
    {"tag", "@/target/note.txt"},
    {"tag", "@/target/note.txt", notUTF8},
    {"tag", "@/target/note.txt", std::string(70'000, 't')},
    {"tag", "@/target", ""},
    {"tag", "@/missing", "Red"},
    {"tag", "root", "Red"},
    {"tag", "@/" + noUTF8, "Blue"},
    {"tag", "@/" + noUTF8, "--clear"},
    {"favorite", "@/target/note.txt", "2"},
    {"favorite", "@/" + noUTF8, "-1"},
    {"favorite", "@/" + lines, "18446744073709551615"},
    {"favorite", "@/folder", "0.1"},
    {"favorite", "@/target", "nan"},
    {"favorite", "@/target", "1e300"},
    {"favorite", "@/target", "red"},
    {"favorite", "@/missing"},
    {"favorites"},
    {"favorites", "--limit", "2"},
    {"favorite", "@/folder", "--clear"},
    {"used", "@/target/note.txt", "2001-02-03T04:05:06.789Z"},
    {"used", "@/" + noUTF8, "1969-12-31T23:59:59.000000001Z"},
    {"used", "@/" + lines, "2001-02-03"},
    {"used", "@/target", "yesterday"},
    {"used", "@/missing", "2001-02-03"},
    {"used", "root", "2001-02-03"},
    {"info", "@/target/note.txt"},
    {"info", "@/" + noUTF8},
    {"used", "@/" + noUTF8, "--clear"},
    // Searches.
    {"search", "note"},
    {"search", "CAF"},
    {"search", notUTF8},
    {"search", "--tag", "red"},
    {"search", "--tag", notUTF8},
    {"search", "--type", notUTF8},
    {"search", "--type", "text/*", "--since", "90m"},
    {"search", "--before", "2001-01-01"},
    {"search", "--since", "never", "x"},
    {"search", std::string(5000, 'x')},
    {"search", "1", "--limit", "3"},
    {"search", " "},
    {"recent", "--limit", "2"},
    // Of a file with several names, the one that is given.
    {"rename", "@/b/linked", "linked " + noUTF8},
    {"info", "@/b/linked"},
    {"info", "@/a/linked"},
    {"mv", "@/b/linked " + noUTF8, "@/target"},
    {"trash", "@/a/linked"},
    {"restore", "@/.Trash/linked"},
    {"rm", "@/target/linked " + noUTF8},
    {"ls", "@/a"},
    {"ls", "@/b"},
    {"rm", "@/a/linked"},
    // The trash.
    {"trash", "@/target/note.txt", "@/" + noUTF8, "@/missing", "@/many"},
    {"trash", "root"},
    {"trash", "#org.example.Draw"},
    {"search", "note", "--trashed"},
    {"ls", "@/.Trash"},
    {"info", "@/.Trash/note.txt"},
    {"restore", "@/.Trash/note.txt"},
    {"restore", "@/target/note.txt"},
    {"restore", "@/.Trash/many", "--to", "@/folder"},
    {"restore", "@/.Trash/" + noUTF8, "--to", "@/link"},
    {"restore", "@/.Trash/" + noUTF8, "--to", "did=99999"},
    {"expire", "--older-than", "30d", "--dry-run"},
    {"expire", "--older-than", "2100-01-01", "--dry-run"},
    {"expire", "--older-than", "2100-01-01"},
    {"expire", "--older-than", "long"},
    {"rm", "@/folder", "@/missing", "--dry-run"},
    {"anchor", "workingset"},
    {"rm", "@/folder/inside.txt", "@/missing", "@/new"},
    {"changes", "--since", "$", "workingset"},
    {"rm", "root"},
    {"rm", "#org.example.Draw"},
    {"rm", "@/folder"},
    // Applications.
    {"apps"},
    {"container", "org.example.Draw"},
    {"container", "org.example.Plain"},
    {"container", "org.example.Missing"},
    {"container", ""},
    {"container", notUTF8},
    {"icon", "@/" + lines, "-o", "~/icon.png"},
    {"icon", "@/missing", "-o", "~/icon.png"},
    {"icon", "#org.example.Draw", "-o", "~/missing/icon.png"},
    {"icon", "#org.example.Draw", "-o", "~/icon.png", "--size", "16"},
    {"icon", "#org.example.Draw", "-o", "~/icon.png", "--size", "0"},
    {"status"},
};

TEST_P(SameAnswers, ThroughTheServiceAndWithoutIt) {
  Side served(home, options({}));
  const TempHome other;
  Side embedded(other, options({"--embedded"}));
  serve();
  for (const Words& command : commands) {
    const auto expected = embedded.run(command);
    EXPECT_EQ(served.run(command), expected) << ::testing::PrintToString(command);
  }
}

INSTANTIATE_TEST_SUITE_P(ForPeopleAndPrograms, SameAnswers, ::testing::Bool());

std::pair<int, std::string> answerOf(const Words& arguments) {
  std::ostringstream out;
  std::ostringstream err;
  const int code = runCommandLine(arguments, {out, err});
  return {code, out.str() + err.str()};
}

using ServedHome = ServiceFixture;

TEST_F(ServedHome, IsFoundUnderEachOfItsNamesAndAnotherIsNot) {
  home.writeFile("doc");
  serve();
  fs::create_directory_symlink(home.path(), home.path() + "/alias");
  const auto expected = std::pair(0, home.at("doc") + "\n");
  // Without the service they would wait for it to give the volume back.
  for (const char* name : {"", "/", "/.", "/alias", "/Documents/.."})
    EXPECT_EQ(answerOf({"--home", home.path() + name, "--timeout", "0", "path", home.at("doc")}),
              expected)
        << name;
  const TempHome other;
  EXPECT_EQ(answerOf({"--home", other.path(), "--timeout", "0", "path", other.documents()}),
            std::pair(0, other.documents() + "\n"));
}

TEST_F(ServedHome, MayHaveANameOfBytesAndStillGetsItsErrors) {
  const std::string path = home.path() + "/" + noUTF8;
  fs::create_directories(path + "/Documents");
  service = std::make_unique<Running>(Words{MIRABEL_PROGRAM, "--home", path, "serve"});
  ASSERT_THAT(service->errors().line(), ::testing::StartsWith("mirabel: serving "));
  // The error names the home; a message that the bus refuses would leave the command waiting.
  EXPECT_EQ(answerOf({"--home", path, "--timeout", "0", "info", "/etc"}),
            std::pair(3, "mirabel: can't find /etc; it is not below the document storage \"" +
                             home.path() +
                             "/caf\\xe9/Documents\", nor in the folder of an app "
                             "library\n"));
}

}  // namespace
}  // namespace mirabel::testing
