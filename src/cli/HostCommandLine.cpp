#include "cli/HostCommandLine.h"

#include <CLI/CLI.hpp>

#include "cli/Completion.h"
#include "cli/TextOptions.h"

namespace mirabel {
namespace {

constexpr const char* searchHelp =
    "Each of the WORDS must be part of a word of the name or of a tag, in any case and with any\n"
    "accents. The trash is left out unless it is asked for.\n\n";
constexpr const char* serveHelp =
    "Other programs reach it as com.norvane.Vessel1 on the session bus, and so do the other\n"
    "commands of this one. It goes on until it is asked to end.\n\n";
constexpr const char* completionHelp =
    "For bash: mirabel completion bash >~/.local/share/bash-completion/completions/mirabel\n\n";
constexpr std::uint32_t mostAsked = 10'000;

CLI::App& add(CLI::App& app, const char* name, const char* description, const std::string& footer) {
  CLI::App* added = app.add_subcommand(name, description);
  added->footer(footer);
  return *added;
}

void addLimit(CLI::App& command, std::uint32_t& limit, const char* help) {
  command.add_option("--limit", limit, help)->type_name("N")->check([](const std::string& text) {
    const bool isCount = !text.empty() && text.size() <= 5 &&
                         text.find_first_not_of("0123456789") == std::string::npos;
    return isCount && std::stoul(text) >= 1 && std::stoul(text) <= mostAsked
               ? ""
               : "takes a number from 1 to 10000";
  });
}

void addSearch(CLI::App& app, SearchOptions& options, const std::string& footer) {
  CLI::App& search =
      add(app, "search", "Find documents by name, tag, type and date", searchHelp + footer);
  addTexts(search, "WORDS", options.words, "Parts of names or tags")->type_name("");
  addTexts(search, "--tag", options.tags, "Only what has this tag; may be given again")
      ->type_name("LABEL");
  addText(search, "--type", options.type, "Only this type, or family: image/png, image/*")
      ->type_name("TYPE");
  addText(search, "--since", options.since, "Only what was modified since")->type_name("DATE|AGE");
  addText(search, "--before", options.before, "Only what was modified before")
      ->type_name("DATE|AGE");
  search.add_flag("--trashed", options.includesTrashed, "The trash too");
  addLimit(search, options.limit, "At most so many (100)");
}

}  // namespace

void addHostCommands(CLI::App& app, HostArguments& arguments, const std::string& footer) {
  addSearch(app, arguments.search, footer);
  addLimit(add(app, "recent", "List the documents that were used or changed last", footer),
           arguments.mostRecent, "At most so many (20)");
  addLimit(add(app, "favorites", "List the favourites by their rank", footer),
           arguments.mostFavorites, "At most so many (1000)");
  add(app, "serve", "Serve the documents to other programs", serveHelp + footer);
  CLI::App& completion =
      add(app, "completion", "Print what completes this program's arguments in a shell",
          completionHelp + footer);
  addText(completion, "SHELL", arguments.shell, "bash, zsh or fish")
      ->required()
      ->type_name("")
      ->check([](const std::string& shell) {
        const bool isKnown = shell == "bash" || shell == "zsh" || shell == "fish";
        return isKnown ? "" : "is bash, zsh or fish";
      });
}

std::optional<ExitCode> runHostCommand(const CLI::App& app, Program& program,
                                       const HostArguments& arguments) {
  if (app.got_subcommand("search")) return runSearch(program, arguments.search);
  if (app.got_subcommand("recent")) return runRecent(program, arguments.mostRecent);
  if (app.got_subcommand("favorites")) return runFavorites(program, arguments.mostFavorites);
  if (app.got_subcommand("serve")) return runServe(program);
  if (app.got_subcommand("completion")) {
    program.out() << completionFor(app, arguments.shell);
    return ExitCode::done;
  }
  return {};
}

}  // namespace mirabel
