#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/Program.h"

namespace mirabel {

// Commands that change items; each reports its own failures and answers the code to end with. Those
// that take several items go on after a failure.

struct CreateOptions {
  std::string name;
  std::string parent;
};
ExitCode runMakeFolder(Program& program, const CreateOptions& options);

struct ImportOptions {
  std::vector<std::string> files;
  std::string parent;
};
ExitCode runImport(Program& program, const ImportOptions& options);

struct RenameOptions {
  std::string item;
  std::string name;
};
ExitCode runRename(Program& program, const RenameOptions& options);

struct MoveOptions {
  std::string item;
  std::string parent;
  std::optional<std::string> name;
};
ExitCode runMove(Program& program, const MoveOptions& options);

struct RemoveOptions {
  std::vector<std::string> items;
  bool isDryRun = false;
};
ExitCode runRemove(Program& program, const RemoveOptions& options);

ExitCode runTrash(Program& program, const std::vector<std::string>& items);

struct RestoreOptions {
  std::vector<std::string> items;
  std::optional<std::string> parent;
};
ExitCode runRestore(Program& program, const RestoreOptions& options);

struct ExpireOptions {
  std::string olderThan;  ///< see `referenceDateFrom`
  bool isDryRun = false;
};
ExitCode runExpire(Program& program, const ExpireOptions& options);

struct TagOptions {
  std::string item;
  std::vector<std::string> labels;
  bool clears = false;
};
ExitCode runTag(Program& program, const TagOptions& options);

struct FavoriteOptions {
  std::string item;
  std::optional<std::string> rank;  ///< absent: 1
  bool clears = false;
};
ExitCode runFavorite(Program& program, const FavoriteOptions& options);

struct UsedOptions {
  std::string item;
  std::optional<std::string> date;  ///< absent: now
  bool clears = false;
};
ExitCode runUsed(Program& program, const UsedOptions& options);

}  // namespace mirabel
