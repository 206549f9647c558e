#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <set>
#include <sstream>
#include <unistd.h>

#include "cli/Commands.h"
#include "cli/ItemCommands.h"
#include "cli/Printing.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

/// A home that is gone when the demonstration ends.
class TemporaryHome {
 public:
  TemporaryHome() {
    std::string pattern = fs::temp_directory_path() / "mirabel-demo-XXXXXX";
    if (::mkdtemp(pattern.data()) != nullptr) path_ = pattern;
  }
  ~TemporaryHome() {
    std::error_code ignored;
    if (!path_.empty()) fs::remove_all(path_, ignored);
  }
  TemporaryHome(const TemporaryHome&) = delete;
  TemporaryHome& operator=(const TemporaryHome&) = delete;

  [[nodiscard]] const fs::path& path() const { return path_; }

 private:
  fs::path path_;
};

class Tour {
 public:
  Tour(Program& program, const fs::path& home)
      : out_(program.out()), home_(home), documents_(home / "Documents") {}

  bool run() {
    say("A temporary home with a few documents, and an application that has documents of its own.");
    return makeDocuments() && list() && rename() && save() && moveAndReuse() &&
           changesWhileNothingRan() && trashAndPutBack();
  }

 private:
  void say(std::string_view text) { out_ << "\n# " << text << '\n'; }
  void shell(std::string_view text) { out_ << "$ " << text << '\n'; }

  bool write(const fs::path& file, std::string_view contents) {
    fs::create_directories(file.parent_path());
    std::ofstream stream(file, std::ios::binary);
    stream << contents;
    stream.close();
    return stream.good();
  }

  // Runs one command as a process of its own would: the provider starts and stops each time, so
  // whatever is found again was found on disk.
  std::string command(const std::string& shown, ExitCode (*execute)(Program&, const std::string&),
                      const std::string& argument) {
    shell("mirabel " + shown);
    std::ostringstream answer;
    GlobalOptions options;
    options.home = home_;
    Program program(options, {answer, out_});
    const ExitCode code = execute(program, argument);
    out_ << answer.str();
    std::string line = answer.str();
    if (code == ExitCode::done && line.ends_with('\n')) line.pop_back();
    return code == ExitCode::done ? line : std::string();
  }

  bool makeDocuments() {
    const bool made = write(documents_ / "letter.txt", "Dear Aunt Mirabel,\n") &&
                      write(documents_ / "budget.csv", "rent,900\nfood,350\n") &&
                      write(documents_ / "Recipes/soup.md", "# Soup\n") &&
                      write(documents_ / "Recipes/bread.md", "# Bread\n") &&
                      write(documents_ / "Holiday.quill/text.xml", "<text>Sea and sun</text>\n") &&
                      installApplication();
    if (!made) say("The documents can't be written.");
    return made;
  }

  // As Flatpak does: an entry that says that it opens files, and a container.
  bool installApplication() {
    return write(home_ / ".local/share/flatpak/exports/share/applications/org.example.Draw.desktop",
                 "[Desktop Entry]\nType=Application\nName=Draw\nExec=draw %F\n"
                 "MimeType=image/svg+xml;\n") &&
           write(home_ / ".var/app/org.example.Draw/Documents/boat.svg", "<svg/>\n");
  }

  bool list() {
    say("Every item has an identifier; a folder that is one document (Holiday.quill) has one too. "
        "The folder of an application (Draw) stands beside them.");
    const auto listing = [](Program& program, const std::string& item) {
      ListOptions options;
      options.item = item;
      return runList(program, options);
    };
    const bool listed = !command("ls", listing, "root").empty();
    letter_ = command("id ~/Documents/letter.txt", runId, documents_ / "letter.txt");
    return listed && !letter_.empty();
  }

  bool rename() {
    say("Rename it while nothing runs: the identifier leads to the new name.");
    shell("mv ~/Documents/letter.txt ~/Documents/thanks.txt");
    fs::rename(documents_ / "letter.txt", documents_ / "thanks.txt");
    return expectAt("thanks.txt");
  }

  bool save() {
    say("Save it as editors do: a new file, synced, renamed over the old one. The inode is "
        "another, the document is the same.");
    shell("echo 'Thank you!' > .thanks.tmp && sync .thanks.tmp && mv .thanks.tmp thanks.txt");
    const fs::path temporary = documents_ / ".thanks.tmp";
    if (!write(temporary, "Thank you!\n") || !sync(temporary)) return false;
    fs::rename(temporary, documents_ / "thanks.txt");
    return expectAt("thanks.txt");
  }

  bool moveAndReuse() {
    say("Move it, and give its old name to something else: that is another document.");
    shell("mv ~/Documents/thanks.txt ~/Documents/Recipes/ && echo new > ~/Documents/thanks.txt");
    fs::rename(documents_ / "thanks.txt", documents_ / "Recipes/thanks.txt");
    if (!write(documents_ / "thanks.txt", "new\n") || !expectAt("Recipes/thanks.txt")) return false;
    const std::string other =
        command("id ~/Documents/thanks.txt", runId, documents_ / "thanks.txt");
    if (other.empty() || other == letter_) return false;
    say("Everything that is known of it:");
    return !command("info " + letter_, runInfo, letter_).empty();
  }

  bool changesWhileNothingRan() {
    say("Take an anchor, change a few things while nothing runs, and ask what has changed since.");
    const std::string bread =
        command("id ~/Documents/Recipes/bread.md", runId, documents_ / "Recipes/bread.md");
    const std::string anchor = command("anchor workingset", runAnchor, "workingset");
    if (bread.empty() || anchor.empty() || !changeAFewThings()) return false;
    const auto changes = [](Program& program, const std::string& since) {
      return runChanges(program, {"workingset", since});
    };
    const std::string told = command("changes workingset --since ANCHOR", changes, anchor);
    if (!isAllThatChanged(told, bread)) return false;
    say("That is all of it, and nothing else: the folder is told too, for what it holds changed.");
    return true;
  }

  bool trashAndPutBack() {
    say("Trash it, rename the folder that it came from, and put it back: it finds its way.");
    const auto trash = [](Program& program, const std::string& item) {
      return runTrash(program, {item});
    };
    const auto restore = [](Program& program, const std::string& item) {
      return runRestore(program, {{item}, {}});
    };
    if (command("trash " + letter_, trash, letter_).empty()) return false;
    shell("mv ~/Documents/Recipes ~/Documents/Kitchen");
    fs::rename(documents_ / "Recipes", documents_ / "Kitchen");
    if (command("restore " + letter_, restore, letter_).empty()) return false;
    return expectAt("Kitchen/thanks.txt");
  }

  bool changeAFewThings() {
    shell("mv ~/Documents/budget.csv ~/Documents/2027.csv");
    fs::rename(documents_ / "budget.csv", documents_ / "2027.csv");
    shell("echo '# Salad' > ~/Documents/salad.md");
    shell("rm ~/Documents/Recipes/bread.md");
    fs::remove(documents_ / "Recipes/bread.md");
    shell("cd ~/Documents/Recipes && echo 'Thanks again!' > .new && mv .new thanks.txt");
    if (!write(documents_ / "salad.md", "# Salad\n") ||
        !write(documents_ / "Recipes/.new", "Thanks again!\n")) {
      return false;
    }
    fs::rename(documents_ / "Recipes/.new", documents_ / "Recipes/thanks.txt");
    return true;
  }

  // Lines are "updated  IDENTIFIER  PATH" and "deleted  IDENTIFIER".
  bool isAllThatChanged(const std::string& told, const std::string& deleted) const {
    std::set<std::string> paths;
    std::istringstream lines(told);
    std::string verb;
    for (std::string line; std::getline(lines, line);) {
      std::istringstream words(line);
      std::string identifier;
      std::string path;
      words >> verb >> identifier >> std::ws;
      std::getline(words, path);
      if (verb == "deleted" && identifier != deleted) return false;
      const bool isLetter = path == documents_ / "Recipes/thanks.txt";
      if (isLetter != (identifier == letter_)) return false;
      paths.insert(path);
    }
    const std::set<std::string> expected = {"", documents_ / "2027.csv", documents_ / "salad.md",
                                            documents_ / "Recipes",
                                            documents_ / "Recipes/thanks.txt"};
    return paths == expected;
  }

  static bool sync(const fs::path& file) {
    const UniqueFd opened(::open(file.c_str(), O_RDONLY | O_CLOEXEC));
    return opened && ::fsync(opened.get()) == 0;
  }

  bool expectAt(const fs::path& place) {
    const std::string found = command("path " + letter_, runPath, letter_);
    return found == (documents_ / place).native();
  }

  std::ostream& out_;
  fs::path home_;
  fs::path documents_;
  std::string letter_;
};

}  // namespace

ExitCode runDemo(Program& program) {
  const TemporaryHome home;
  if (home.path().empty()) {
    return program.report(Error::posix(errno), "can't make a temporary home");
  }
  std::error_code failure;
  const fs::path resolved = fs::canonical(home.path(), failure);
  if (failure) return program.report(Error::posix(failure.value()), "can't make a temporary home");
  try {
    if (Tour(program, resolved).run()) {
      program.out() << "\nThe home was temporary and is gone. Try it on your own: mirabel ls\n";
      return ExitCode::done;
    }
  } catch (const fs::filesystem_error& error) {
    return program.report(Error::posix(error.code().value(), error.what()), "the tour broke off");
  }
  program.note("the tour did not find what it expected; run \"mirabel doctor\"");
  return ExitCode::failed;
}

}  // namespace mirabel
