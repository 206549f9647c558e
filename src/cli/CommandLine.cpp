#include "cli/CommandLine.h"

#include <CLI/CLI.hpp>
#include <memory>

#include "cli/ArgumentParser.h"
#include "foundation/Log.h"
#include "foundation/StandardErrorSink.h"
#include "linux/log/JournalSink.h"

namespace mirabel {
namespace {

ExitCode dispatch(const CLI::App& app, Program& program, const Arguments& arguments) {
  if (app.got_subcommand("id")) return runId(program, arguments.path);
  if (app.got_subcommand("path")) return runPath(program, arguments.item);
  if (app.got_subcommand("info")) return runInfo(program, arguments.item);
  if (app.got_subcommand("ls")) return runList(program, arguments.list);
  if (app.got_subcommand("anchor")) return runAnchor(program, arguments.container);
  if (app.got_subcommand("changes")) return runChanges(program, arguments.changes);
  if (app.got_subcommand("watch")) return runWatch(program, arguments.watch);
  if (const auto code = runItemCommand(app, program, arguments.items)) return *code;
  if (const auto code = runHostCommand(app, program, arguments.host)) return *code;
  if (app.got_subcommand("apps")) return runApps(program);
  if (app.got_subcommand("container")) return runContainer(program, arguments.bundle);
  if (app.got_subcommand("icon")) return runIcon(program, arguments.icon);
  if (app.got_subcommand("status")) return runStatus(program);
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
  ArgumentParser parser;
  if (const auto code = parser.parse(arguments, streams)) return *code;
  const Arguments& parsed = parser.arguments();
  setUpLog(parsed.global.verbose);
  Program program(parsed.global, streams);
  return static_cast<int>(dispatch(parser.app(), program, parsed));
}

}  // namespace mirabel
