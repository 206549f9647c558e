#include "cli/CommandLine.h"

#include <CLI/CLI.hpp>
#include <memory>

#include "cli/Commands.h"
#include "foundation/Log.h"
#include "foundation/StandardErrorSink.h"
#include "linux/log/JournalSink.h"

namespace mirabel {
namespace {

constexpr const char* purpose =
    "Gives every file and folder of a person's documents an identity that lasts: through renames, "
    "moves, atomic saves and restarts.";
constexpr const char* itemHelp =
    "ITEM is an identifier (fid=N, did=N, #bundle), the word root, or else a path "
    "(./fid=3 is a path).\n\n"
    "Exit codes: 0 done, 1 failed, 2 usage, 3 no such item, 4 start over, 5 not permitted, "
    "6 name taken, 7 busy.";

/// Everything that the command line may say.
struct Arguments {
  GlobalOptions global;
  double timeoutSeconds = 30;
  std::string path;
  std::string item;
  ListOptions list;
  bool showVersion = false;
};

void addGlobalOptions(CLI::App& app, Arguments& arguments) {
  app.add_option("--home", arguments.global.home,
                 "Work on the documents of this home instead of $HOME; nothing outside of it is "
                 "used then")
      ->type_name("DIR");
  app.add_flag("--json", arguments.global.json, "Print JSON Lines, for programs");
  app.add_flag("--embedded", arguments.global.embedded,
               "Run the provider in this process, whether or not a service runs");
  app.add_flag("--verbose", arguments.global.verbose, "Write the log to standard error");
  app.add_option("--timeout", arguments.timeoutSeconds,
                 "Seconds to wait for another process that is using the volume (30)")
      ->type_name("SECONDS")
      ->check(CLI::Range(0.0, 86'400.0));
  app.add_flag("--version", arguments.showVersion, "Print the version");
}

void addCommands(CLI::App& app, Arguments& arguments) {
  auto* id = app.add_subcommand("id", "Print the identifier of what lies at a path");
  id->add_option("PATH", arguments.path, "A path, relative or absolute")->required();
  auto* path = app.add_subcommand("path", "Print where an item lies now");
  path->add_option("ITEM", arguments.item, "An identifier")->required();
  auto* info = app.add_subcommand("info", "Print everything that is known of an item");
  info->add_option("ITEM", arguments.item, "An identifier or a path")->required();
  auto* list = app.add_subcommand("ls", "List a folder, 200 items a page");
  list->add_option("ITEM", arguments.list.item, "An identifier or a path (root)");
  list->add_option("--page", arguments.list.page, "Go on at this page of an earlier listing")
      ->type_name("PAGE");
  list->add_option("--pages", arguments.list.pages, "Stop after so many pages (all)")
      ->type_name("N");
  app.add_subcommand("doctor", "Say what of this machine is in the way, and how to mend it");
  app.add_subcommand("demo", "A guided tour in a temporary home");
}

ExitCode dispatch(const CLI::App& app, Program& program, const Arguments& arguments) {
  if (app.got_subcommand("id")) return runId(program, arguments.path);
  if (app.got_subcommand("path")) return runPath(program, arguments.item);
  if (app.got_subcommand("info")) return runInfo(program, arguments.item);
  if (app.got_subcommand("ls")) return runList(program, arguments.list);
  if (app.got_subcommand("doctor")) return runDoctor(program);
  return runDemo(program);
}

// People read errors where they happen, so only --verbose shows the log; else it goes to the
// machine's journal.
void setUpLog(bool verbose) {
  if (verbose) {
    Log::shared().setSink(std::make_shared<StandardErrorSink>(), LogLevel::debug);
  } else {
    Log::shared().setSink(std::make_shared<JournalSink>(), LogLevel::info);
  }
}

}  // namespace

int runCommandLine(const std::vector<std::string>& arguments, Streams streams) {
  CLI::App app(purpose, "mirabel");
  Arguments parsed;
  addGlobalOptions(app, parsed);
  addCommands(app, parsed);
  app.fallthrough();
  app.footer(itemHelp);
  app.require_subcommand(0, 1);
  try {
    // The parser takes its arguments from the back.
    app.parse(std::vector<std::string>(arguments.rbegin(), arguments.rend()));
  } catch (const CLI::ParseError& error) {
    const int code = app.exit(error, streams.out, streams.err);
    return code == 0 ? 0 : static_cast<int>(ExitCode::usage);
  }
  if (parsed.showVersion) {
    streams.out << "mirabel " MIRABEL_VERSION "\n";
    return 0;
  }
  if (app.get_subcommands().empty()) {
    streams.err << app.help();
    return static_cast<int>(ExitCode::usage);
  }
  parsed.global.timeout =
      std::chrono::milliseconds(static_cast<long>(parsed.timeoutSeconds * 1000));
  setUpLog(parsed.global.verbose);
  Program program(parsed.global, streams);
  return static_cast<int>(dispatch(app, program, parsed));
}

}  // namespace mirabel
