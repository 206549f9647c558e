#include "cli/IconCommand.h"

#include <cerrno>
#include <fstream>
#include <nlohmann/json.hpp>
#include <optional>
#include <ostream>
#include <utility>

#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

constexpr std::int64_t largestSize = 4096;
constexpr const char* standardOutput = "-";

Result<void> write(const std::string& file, const Data& bytes) {
  errno = 0;
  std::ofstream out(file, std::ios::binary | std::ios::trunc);
  out << stringView(bytes);
  // What is still to be written may fail only now.
  out.close();
  if (out) return {};
  return fail(Error::posix(errno == 0 ? EIO : errno));
}

}  // namespace

ExitCode runIcon(Program& program, const IconOptions& options) {
  if (options.size < 1 || options.size > largestSize) {
    return program.reportUsage("--size takes 1 to " + std::to_string(largestSize) + " pixels");
  }
  if (options.file == standardOutput && program.isTerminal()) {
    return program.reportUsage("a terminal shows no picture; name a file, or redirect the output");
  }
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto found = ItemArgument(options.item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + named(options.item));
  const auto picture =
      documents->icon(found->itemIdentifier, static_cast<std::uint32_t>(options.size));
  if (!picture)
    return program.report(picture.error(), "can't get the icon of " + named(options.item));
  if (!*picture) {
    return program.reportFailed(options.item +
                                " has no icon; only the documents of an application have one");
  }
  if (options.file == standardOutput) {
    program.out() << stringView(**picture);
    return ExitCode::done;
  }
  if (auto written = write(options.file, **picture); !written) {
    return program.report(written.error(), "can't write " + named(options.file));
  }
  if (program.options().json) {
    nlohmann::json line;
    setText(line, "path", options.file);
    line["bytes"] = std::to_string((*picture)->size());
    program.out() << line.dump() << '\n';
  } else {
    program.out() << "wrote " << printable(options.file) << "  (" << humanSize((*picture)->size())
                  << ")\n";
  }
  return ExitCode::done;
}

}  // namespace mirabel
