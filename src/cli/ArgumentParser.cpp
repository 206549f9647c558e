#include "cli/ArgumentParser.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <memory>
#include <ostream>
#include <string_view>
#include <utility>

#include "cli/TextOptions.h"
#include "cli/UsageText.h"

namespace mirabel {
namespace {

constexpr const char* purpose =
    "Gives every file and folder of a person's documents an identity that lasts: through\n"
    "renames, moves, atomic saves and restarts.";
constexpr const char* itemHelp =
    "ITEM is the word root, an identifier or a path. What begins with fid=, did= or # and has\n"
    "no / in it is an identifier: did=N for a document, fid=N for a folder or anything else,\n"
    "#bundle for the documents of an application. Everything else is a path; ./fid=3 is one.\n\n";
const std::string containerHelp =
    "ITEM is the word root, a folder's identifier or path, workingset for everything, or alldirs\n"
    "for every folder.\n\n";
constexpr const char* watchHelp =
    "It goes on until it is interrupted, and then tells the anchor to go on from. Without\n"
    "the service it holds the volume as long as it runs: other commands wait for that, and then\n"
    "say that it is busy.\n\n";
constexpr const char* bundleHelp =
    "BUNDLE is the name of the application's desktop entry without .desktop, org.example.Draw.\n\n";
constexpr const char* libraryHelp =
    "ITEM is an app library: # and the identifier of the application, as mirabel apps lists\n"
    "them.\n\n";
constexpr const char* anchorHelp =
    "An anchor is a moment in the history of the documents, to ask for what has changed since.\n\n";
constexpr const char* pathHelp =
    "PATH is relative or absolute. Links on its way are followed, one at its end is not.\n\n";
constexpr const char* exitCodeHelp =
    "Exit codes: 0 done, 1 failed, 2 usage, 3 no such item, 4 start over, 5 not permitted,\n"
    "6 name taken, 7 busy.";
const std::string globalHelp = "Global options: see mirabel --help.";
constexpr double longestTimeout = 86'400;

void addGlobalOptions(CLI::App& app, Arguments& arguments) {
  addText(app, "--home", arguments.global.home, "Work on the documents of this home, not of $HOME")
      ->type_name("DIR");
  app.add_flag("--json", arguments.global.json, "Print JSON Lines, for programs");
  app.add_flag("--embedded", arguments.global.embedded,
               "Run the provider in this process, whether or not a service runs");
  app.add_flag("--verbose", arguments.global.verbose, "Write the log to standard error");
  app.add_option("--timeout", arguments.timeoutSeconds,
                 "Seconds to wait for another process that is using the volume (30)")
      ->type_name("SECONDS");
  app.add_flag("--version", arguments.showVersion, "Print the version");
}

/// Shows the options that have to be given in the usage line too.
class UsageFormatter final : public CLI::Formatter {
 public:
  std::string make_usage(const CLI::App* app, std::string name) const override {
    std::string usage = CLI::Formatter::make_usage(app, std::move(name));
    std::string required;
    for (const CLI::Option* option : app->get_options()) {
      if (option->get_required() && !option->get_positional())
        required += " " + option->get_name() + " " + option->get_type_name();
    }
    constexpr std::string_view before = "[OPTIONS]";
    const std::size_t place = usage.find(before);
    if (place != std::string::npos) usage.insert(place + before.size(), required);
    return usage;
  }
};

CLI::App* addCommand(CLI::App& app, const char* name, const char* description,
                     const std::string& argumentHelp) {
  CLI::App* command = app.add_subcommand(name, description);
  command->footer(argumentHelp + globalHelp);
  return command;
}

void addItem(CLI::App& command, std::string& item) {
  addText(command, "ITEM", item, "root, an identifier or a path")->required()->type_name("");
}

// The library's own check for positive numbers names their upper end in 300 digits.
std::string isPageCount(const std::string& text) {
  const bool isCount = text.find_first_not_of("0123456789") == std::string::npos &&
                       text.find_first_not_of('0') != std::string::npos;
  return isCount ? "" : "takes a number from 1";
}

void addAppCommands(CLI::App& app, Arguments& arguments) {
  addCommand(app, "apps", "List the app libraries: the applications that show their documents", "");
  auto* container =
      addCommand(app, "container", "Print where the documents of an application lie", bundleHelp);
  addText(*container, "BUNDLE", arguments.bundle, "The identifier of the application")
      ->required()
      ->type_name("");
  auto* icon =
      addCommand(app, "icon", "Write the icon of an app library to a PNG file", libraryHelp);
  addText(*icon, "ITEM", arguments.icon.item, "#bundle, or the path of its documents")
      ->required()
      ->type_name("");
  addText(*icon, "-o,--output", arguments.icon.file,
          "The file that it goes to, which is replaced; - for standard output")
      ->required()
      ->type_name("FILE");
  icon->add_option("--size", arguments.icon.size, "Its width and height in pixels (256)")
      ->type_name("N");
}

void addCommands(CLI::App& app, Arguments& arguments) {
  auto* id = addCommand(app, "id", "Print the identifier of what lies at a path", pathHelp);
  addText(*id, "PATH", arguments.path, "What to identify")->required()->type_name("");
  addItem(*addCommand(app, "path", "Print where an item lies now", itemHelp), arguments.item);
  addItem(*addCommand(app, "info", "Print everything that is known of an item", itemHelp),
          arguments.item);
  auto* list = addCommand(app, "ls", "List a folder, 200 items a page", containerHelp);
  addText(*list, "ITEM", arguments.list.item, "root, workingset, alldirs or a folder (root)")
      ->type_name("");
  addText(*list, "--page", arguments.list.page, "Go on at this page of an earlier listing")
      ->type_name("PAGE");
  list->add_option("--pages", arguments.list.pages, "Stop after so many pages (all)")
      ->type_name("N")
      ->check(isPageCount);
  auto* anchor = addCommand(app, "anchor", "Print the anchor of now, to ask for changes from there",
                            containerHelp);
  addText(*anchor, "ITEM", arguments.container, "root, workingset, alldirs or a folder (root)")
      ->type_name("");
  auto* changes = addCommand(app, "changes", "Print what changed since an anchor", containerHelp);
  addText(*changes, "--since", arguments.changes.since, "An anchor that was printed before")
      ->required()
      ->type_name("ANCHOR");
  addText(*changes, "ITEM", arguments.changes.item, "root, workingset, alldirs or a folder (root)")
      ->type_name("");
  auto* watch = addCommand(app, "watch", "Print changes as they come", containerHelp + watchHelp);
  addText(*watch, "ITEM", arguments.watch.item, "root, workingset, alldirs or a folder (root)")
      ->type_name("");
  addText(*watch, "--since", arguments.watch.since,
          "First print what changed since an anchor that was printed before")
      ->type_name("ANCHOR");
  addItemCommands(app, arguments.items, itemHelp, globalHelp);
  addAppCommands(app, arguments);
  addHostCommands(app, arguments.host, globalHelp);
  addCommand(app, "status", "Say how changes are followed, and what the history holds", "");
  addCommand(app, "doctor", "Say what of this machine is in the way, and how to mend it", "");
  addCommand(app, "demo", "A guided tour in a temporary home", "");
}

// One line, with exit code 2; the parser's own codes start at 100.
int wrongUsage(const CLI::App& app, const std::vector<std::string>& arguments,
               const UsageFault& fault, Streams streams) {
  const auto commands = app.get_subcommands();
  const bool isGlobal = !fault.option.empty() && app.get_option_no_throw(fault.option) != nullptr;
  const std::string command =
      commands.empty() || isGlobal ? "" : commands.front()->get_name() + " ";
  const std::string message = fault.text + "; see mirabel " + command + "--help";
  // Where parsing failed, options that it did not come to are not set.
  const auto end = std::find(arguments.begin(), arguments.end(), "--");
  const bool asJSON = std::find(arguments.begin(), end, "--json") != end;
  constexpr auto code = static_cast<int>(ExitCode::usage);
  reportFailure(streams.err, asJSON, "usage", code, message);
  return code;
}

/// The library takes the next argument for the value of such an option, though it be a command.
std::optional<std::string> optionWithoutValue(const std::vector<std::string>& arguments) {
  for (const std::string& argument : arguments) {
    if (argument == "--") break;
    if (argument.starts_with("--") && argument.find('=') + 1 == argument.size()) return argument;
  }
  return {};
}

}  // namespace

ArgumentParser::ArgumentParser() : app_(std::make_unique<CLI::App>(purpose, "mirabel")) {
  // Before the commands are added, for they inherit it: global options may follow the command.
  app_->fallthrough();
  app_->formatter(std::make_shared<UsageFormatter>());
  addGlobalOptions(*app_, parsed_);
  addCommands(*app_, parsed_);
  app_->footer(std::string(itemHelp) + anchorHelp + exitCodeHelp);
  app_->require_subcommand(0, 1);
}

ArgumentParser::~ArgumentParser() = default;

std::optional<int> ArgumentParser::parse(const std::vector<std::string>& arguments,
                                         Streams streams) {
  const Arguments nothing;
  parsed_ = nothing;
  if (const auto option = optionWithoutValue(arguments)) {
    return wrongUsage(*app_, arguments, {*option + " has no value", ""}, streams);
  }
  auto guarded = withGuardedBrackets(arguments);
  // The parser takes its arguments from the back.
  std::ranges::reverse(guarded);
  try {
    app_->parse(std::move(guarded));
  } catch (const CLI::ParseError& error) {
    // Help was asked for; it is that of the command, if one was named.
    if (error.get_exit_code() == 0) return app_->exit(error, streams.out, streams.err);
    return wrongUsage(*app_, arguments, usageFault(*app_, error), streams);
  }
  if (parsed_.showVersion) {
    streams.out << "mirabel " MIRABEL_VERSION "\n";
    return 0;
  }
  if (app_->get_subcommands().empty()) {
    if (parsed_.global.json)
      return wrongUsage(*app_, arguments, {"no command is given", ""}, streams);
    streams.err << app_->help();
    return static_cast<int>(ExitCode::usage);
  }
  // Written so that what is no number is refused too.
  if (!(parsed_.timeoutSeconds >= 0 && parsed_.timeoutSeconds <= longestTimeout)) {
    return wrongUsage(*app_, arguments, {"--timeout takes 0 to 86400 seconds", "--timeout"},
                      streams);
  }
  parsed_.global.timeout =
      std::chrono::milliseconds(static_cast<long>(parsed_.timeoutSeconds * 1000));
  return std::nullopt;
}

}  // namespace mirabel
