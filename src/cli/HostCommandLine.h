#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "cli/Commands.h"

namespace CLI {
class App;
}

namespace mirabel {

/// What the command line says of the search index and the service.
struct HostArguments {
  SearchOptions search;
  std::uint32_t mostRecent = 20;
  std::uint32_t mostFavorites = 1000;
  std::string shell;
};

/// Adds the commands of the search index and the service; `arguments` outlives the app.
void addHostCommands(CLI::App& app, HostArguments& arguments, const std::string& footer);
/// Nothing where none of them was asked for.
[[nodiscard]] std::optional<ExitCode> runHostCommand(const CLI::App& app, Program& program,
                                                     const HostArguments& arguments);

}  // namespace mirabel
