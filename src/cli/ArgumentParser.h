#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/Commands.h"
#include "cli/HostCommandLine.h"
#include "cli/IconCommand.h"
#include "cli/ItemCommandLine.h"

namespace CLI {
class App;
}

namespace mirabel {

/// Everything that the command line may say.
struct Arguments {
  GlobalOptions global;
  double timeoutSeconds = 30;
  std::string path;
  std::string item;
  ListOptions list;
  ChangesOptions changes;
  WatchOptions watch;
  std::string container = "root";
  std::string bundle;
  IconOptions icon;
  ItemArguments items;
  HostArguments host;
  bool showVersion = false;
};

/// Understands the command line, and does nothing of what it asks for. Used by one thread.
class ArgumentParser {
 public:
  ArgumentParser();
  ~ArgumentParser();
  ArgumentParser(const ArgumentParser&) = delete;
  ArgumentParser& operator=(const ArgumentParser&) = delete;

  /// Reads the arguments that follow the program's name; may be called again. The code to end with
  /// where there is nothing to be run: help or the version was asked for and is written, or what is
  /// wrong was told in one line. Else one command was given, and `arguments` says with what.
  [[nodiscard]] std::optional<int> parse(const std::vector<std::string>& arguments,
                                         Streams streams);

  [[nodiscard]] const Arguments& arguments() const { return parsed_; }
  [[nodiscard]] const CLI::App& app() const { return *app_; }

 private:
  std::unique_ptr<CLI::App> app_;
  Arguments parsed_;
};

}  // namespace mirabel
