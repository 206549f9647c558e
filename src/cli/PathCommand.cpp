#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Commands.h"
#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {

ExitCode runPath(Program& program, const std::string& item) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  auto found = ItemArgument(item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + named(item));
  const std::string& path = found->path;
  if (program.options().json) {
    nlohmann::json line;
    setText(line, "path", path);
    program.out() << line.dump() << '\n';
  } else {
    // Bytes as they are when a program reads them, so that the path can be used.
    program.out() << (program.isTerminal() ? printable(path) : path) << '\n';
  }
  return ExitCode::done;
}

}  // namespace mirabel
