#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "cli/Program.h"

namespace mirabel {

// One function a command; each reports its own failures and answers the code to end with.

ExitCode runId(Program& program, const std::string& path);
ExitCode runPath(Program& program, const std::string& item);
ExitCode runInfo(Program& program, const std::string& item);

struct ListOptions {
  std::string item = "root";
  std::optional<std::string> page;     ///< base64 of a cursor
  std::optional<std::uint64_t> pages;  ///< absent: all
};
ExitCode runList(Program& program, const ListOptions& options);

ExitCode runAnchor(Program& program, const std::string& item);

struct ChangesOptions {
  std::string item = "root";
  std::string since;  ///< base64 of an anchor
};
ExitCode runChanges(Program& program, const ChangesOptions& options);

struct WatchOptions {
  std::string item = "root";
  std::optional<std::string> since;  ///< base64 of an anchor; absent: from now on
};
ExitCode runWatch(Program& program, const WatchOptions& options);

ExitCode runApps(Program& program);
/// Prints the document folder of an application, whether or not it is an app library.
ExitCode runContainer(Program& program, const std::string& bundle);

/// Serves the documents to other programs until it is asked to end.
ExitCode runServe(Program& program);

struct SearchOptions {
  std::vector<std::string> words;
  std::vector<std::string> tags;
  std::optional<std::string> type;
  std::optional<std::string> since;  ///< dates of the last modification
  std::optional<std::string> before;
  bool includesTrashed = false;
  std::uint32_t limit = 100;
};
ExitCode runSearch(Program& program, const SearchOptions& options);
ExitCode runRecent(Program& program, std::uint32_t limit);
ExitCode runFavorites(Program& program, std::uint32_t limit);

ExitCode runStatus(Program& program);
ExitCode runDoctor(Program& program);
ExitCode runDemo(Program& program);

}  // namespace mirabel
