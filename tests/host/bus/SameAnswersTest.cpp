#include <chrono>
#include <filesystem>
#include <fstream>
#include <map>
#include <regex>
#include <sstream>

#include "cli/CommandLine.h"
#include "cli/InstalledApps.h"
#include "host/bus/ServiceFixture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using Words = std::vector<std::string>;

const std::string noUTF8 = "caf\xe9";

void replaceAll(std::string& text, std::string_view what, std::string_view by) {
  for (std::size_t at = 0; (at = text.find(what, at)) != std::string::npos; at += by.size())
    text.replace(at, what.size(), by);
}

/// What a word of a command stands for. NOTEXT is UTF-8, but no text for the bus.
std::string meant(std::string word) {
  static const std::pair<const char*, std::string> names[] = {
      {"BYTES", noUTF8},
      {"LINES", "two\nlines\t\033[31m"},
      {"LONG", std::string(255, 'n')},
      {"NOTEXT", "\xef\xb7\xa5"},
      {"NOUTF8", "\xff\xfe"},
      {"HUGE", std::string(1000, 'x')},
      {"ENORMOUS", std::string(70'000, 't')}};
  for (const auto& [name, bytes] : names)
    replaceAll(word, name, bytes);
  return word;
}

/// The order of what is of one moment would be another in each home.
void writeFile(const TempHome& home, const std::string& name, const std::string& text, int hours) {
  home.writeFile(name, text);
  fs::last_write_time(home.at(name), fs::file_time_type::clock::now() - std::chrono::hours(hours));
}

void prepare(const TempHome& home) {
  for (const char* folder : {"folder", "target", "many", "a", "b"})
    home.makeFolder(folder);
  int hours = 0;
  for (const char* file : {"letter.txt", "BYTES", "LINES", "LONG", "folder/inside.txt"})
    writeFile(home, meant(file), file, ++hours);
  for (int i = 0; i < 230; ++i)
    writeFile(home, "many/" + std::to_string(i), "", 6 + i);
  home.makeSymlink("link", "letter.txt");
  home.makeFifo("fifo");
  writeFile(home, "a/linked", "linked", 6);
  home.link("a/linked", "b/linked");
  home.link("a/linked", "b/linked too");
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
      word = meant(std::move(word));
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
    replaceAll(text, home_.path(), "HOME");
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

// In this order: what one does shows in those that follow. Of words in braces each is said in turn.
constexpr const char* commands = R"(
status;
info {@/letter.txt,@/folder,@/BYTES,@/LINES,@/LONG,@/link,@/fifo,@,root,#org.example.Draw};
info {#org.example.Plain,#,#NOUTF8,#HUGE,did=99999,fid=99999999999999999999,@/missing,@/NOUTF8};
info {@/letter.txt/below,@/LONGn,~/outside,~/.var/app/org.example.Draw/Documents/sketch.txt};
id @/BYTES; path $; id @/folder; {path,info} $; id {~/outside/new.txt,@/.Trash};
path {VesselWorkingSetContainerItemIdentifier,did=0};
ls {root,@,workingset,alldirs,@/folder,#org.example.Draw,#org.example.Plain,#NOUTF8};
ls {@/letter.txt,@/link,@/missing}; ls @/many --pages 1; ls {@/many,@/folder} --page $;
ls @/many --page {,AAAA,not-base64}; ls @/letter.txt --page not-base64; anchor @/folder;
changes --since $ @/folder; changes --since {,AAAA,not-base64} root;
changes --since not-base64 @/letter.txt;
anchor {@/letter.txt,did=99999,alldirs,workingset}; mkdir {new,new} --in root;
mkdir {BYTES,LINES,NOTEXT} --in @/folder; rename @/folder/NOTEXT NOTEXT2; ls @/folder;
mkdir {LONG,LONGn,,.,..,a/b} --in @/folder;
mkdir inside --in {@/letter.txt,did=99999,#org.example.Draw,#org.example.Plain};
import ~/outside/new.txt ~/outside/BYTES ~/missing --in @/folder;
import {~/outside/new.txt,@/fifo,@/folder,} --in @/folder; import ~/outside --in root;
import ~/outside/new.txt --in @/missing; changes --since $ workingset; rename @/letter.txt note.txt;
rename @/note.txt {BYTES,note.txt,x/y,LONGn,BYTESBYTES}; rename @/BYTESBYTES note.txt;
rename {root,#org.example.Draw,@/missing} other; mv @/note.txt @/folder;
mv @/folder/note.txt root --name {new,BYTES2}; mv @/BYTES2 @/target --name note.txt;
mv @/target/note.txt {@/missing,@/link}; mv {@/target,root} @/target;
mv @/target/note.txt #org.example.Draw; mv ~/.var/app/org.example.Draw/Documents/note.txt @/target;
tag @/target/note.txt Red Grün; tag @/target/note.txt; tag @/target/note.txt {NOUTF8,ENORMOUS};
tag @/target {,Red}; tag {@/missing,root} Red; tag @/BYTES {Blue,--clear};
favorite @/target/note.txt 2; favorite @/BYTES -1; favorite @/LINES 18446744073709551615;
favorite @/folder 0.1; favorite @/target {nan,1e300}; favorite @/missing; favorites;
favorites --limit 2; favorite @/folder --clear;
used @/target/note.txt 2001-02-03T04:05:06.789Z; used @/BYTES 1969-12-31T23:59:59.000000001Z;
used @/LINES 2001-02-03; used {@/missing,root} 2001-02-03; info {@/target/note.txt,@/BYTES};
used @/BYTES --clear; search {note,CAF,NOUTF8,HUGE,}; search --tag {red,NOUTF8};
search --type NOUTF8; search --type text/* --since 90m; search --before 2001-01-01;
search 1 --limit 3; recent --limit 2; rename @/b/linked linkedBYTES; info {@/b/linked,@/a/linked};
mv @/b/linkedBYTES @/target; trash @/a/linked; restore @/.Trash/linked; rm @/target/linkedBYTES;
ls {@/a,@/b}; rm @/a/linked;
trash @/target/note.txt @/BYTES @/missing @/many; trash {root,#org.example.Draw};
search note --trashed; ls @/.Trash; info @/.Trash/note.txt;
restore {@/.Trash/note.txt,@/target/note.txt}; restore @/.Trash/many --to @/folder;
restore @/.Trash/BYTES --to {@/link,did=99999};
expire --older-than {30d,2100-01-01} --dry-run; expire --older-than 2100-01-01;
rm @/folder @/missing --dry-run; anchor workingset; rm @/folder/inside.txt @/missing @/new;
changes --since $ workingset; rm {root,#org.example.Draw,@/folder}; apps;
container {org.example.Draw,org.example.Plain,org.example.Missing,,NOUTF8};
icon {@/LINES,@/missing} -o ~/icon.png; icon #org.example.Draw -o ~/missing/icon.png;
icon #org.example.Draw -o ~/icon.png --size 16; status;
)";

std::vector<Words> commandsOf(const std::string& text) {
  std::vector<Words> all;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line, ';');) {
    const std::size_t open = line.find('{');
    const std::size_t close = line.find('}');
    std::istringstream choices(open == line.npos ? "?"
                                                 : line.substr(open + 1, close - open - 1) + ',');
    for (std::string choice; std::getline(choices, choice, ',');) {
      std::istringstream spaced(line);
      Words& words = all.emplace_back();
      for (std::string word; spaced >> word;)
        words.push_back(word.starts_with('{') ? choice : word);
      if (words.empty()) all.pop_back();
    }
  }
  return all;
}

TEST_P(SameAnswers, ThroughTheServiceAndWithoutIt) {
  Side served(home, options({}));
  const TempHome other;
  Side embedded(other, options({"--embedded"}));
  serve();
  for (const Words& command : commandsOf(commands)) {
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
