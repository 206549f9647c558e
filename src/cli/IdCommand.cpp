#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Commands.h"
#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {

ExitCode runId(Program& program, const std::string& path) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto item = ItemArgument::itemAtPath(*documents, path);
  if (!item) return program.report(item.error(), "can't identify " + named(path));
  const std::string& identifier = item->itemIdentifier;
  if (program.options().json) {
    nlohmann::json line;
    setText(line, "itemIdentifier", identifier);
    program.out() << line.dump() << '\n';
  } else {
    program.out() << printable(identifier) << '\n';
  }
  return ExitCode::done;
}

}  // namespace mirabel
