#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/ItemCommands.h"

namespace CLI {
class App;
}

namespace mirabel {

/// What the command line may say to the commands that change items.
struct ItemArguments {
  CreateOptions create;
  ImportOptions import;
  RenameOptions rename;
  MoveOptions move;
  RemoveOptions remove;
  std::vector<std::string> trash;
  RestoreOptions restore;
  ExpireOptions expire;
  TagOptions tag;
  FavoriteOptions favorite;
  UsedOptions used;
};

/// Adds those commands; `arguments` outlives the parser. The help of those that take
/// an ITEM ends with `itemHelp` and `footer`, and of others with the footer.
void addItemCommands(CLI::App& app, ItemArguments& arguments, const std::string& itemHelp,
                     const std::string& footer);
/// Runs the one that was given, if one of them was.
[[nodiscard]] std::optional<ExitCode> runItemCommand(const CLI::App& app, Program& program,
                                                     const ItemArguments& arguments);

}  // namespace mirabel
