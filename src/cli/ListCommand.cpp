#include <algorithm>
#include <cerrno>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>

#include "cli/Commands.h"
#include "cli/ContainerArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {
namespace {

/// A column that all identifiers of a page fit in.
std::size_t identifierWidth(const ItemPage& page) {
  std::size_t width = 14;
  for (const ItemRecord& item : page.items)
    width = std::max(width, displayWidth(printable(item.itemIdentifier)));
  return width;
}

void printRow(const Program& program, const ItemRecord& item, std::size_t width) {
  std::string size;
  if (item.documentSize) size = humanSize(item.documentSize->asUnsigned().value_or(0));
  if (item.childItemCount) size = std::to_string(*item.childItemCount) + " in it";
  std::string date;
  if (item.contentModificationDate) date = humanDate(*item.contentModificationDate);
  std::string name = printable(item.filename);
  const bool isFolder = item.childItemCount.has_value();
  if (isFolder && program.isTerminal()) name = "\033[1;34m" + name + "\033[0m";
  if (isFolder) name += '/';
  program.out() << padded(std::move(size), 12, Align::right) << "  "
                << padded(std::move(date), 16, Align::left) << "  "
                << padded(printable(item.itemIdentifier), width, Align::left) << "  " << name
                << '\n';
}

std::string textOf(const Data& cursor) {
  return base64(stringView(cursor));
}

void print(const Program& program, const ItemPage& page) {
  if (!program.options().json) {
    const std::size_t width = identifierWidth(page);
    for (const auto& item : page.items)
      printRow(program, item, width);
    return;
  }
  nlohmann::json line;
  line["items"] = nlohmann::json::array();
  for (const auto& item : page.items)
    line["items"].push_back(itemJSON(item));
  line["nextPage"] = nullptr;
  if (page.nextPage) line["nextPage"] = textOf(*page.nextPage);
  program.out() << line.dump() << '\n';
}

Result<Data> startOf(const ListOptions& options) {
  if (!options.page) return dataFromString(VesselInitialPageSortedByName);
  const auto bytes = fromBase64(*options.page);
  if (!bytes) return fail(Error::syncAnchorExpired());
  return dataFromString(*bytes);
}

Result<void> list(Program& program, DocumentContainer& container, const ListOptions& options) {
  auto start = startOf(options);
  if (!start) return fail(start.error());
  std::optional<Data> next = *std::move(start);
  for (std::uint64_t printed = 0; next; ++printed) {
    if (options.pages && printed == *options.pages) {
      if (!program.options().json) program.note("it goes on with --page " + textOf(*next));
      return {};
    }
    // The rest of a long folder is not read for nobody.
    if (!program.canWrite()) return fail(Error::posix(EPIPE));
    auto page = container.items(*next);
    if (!page) return fail(page.error());
    print(program, *page);
    next = std::move(page->nextPage);
  }
  return {};
}

}  // namespace

ExitCode runList(Program& program, const ListOptions& options) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto identifier = ContainerArgument(options.item).identifier(*documents);
  if (!identifier) return program.report(identifier.error(), "can't find " + named(options.item));
  const std::string failure = "can't list " + named(options.item);
  const auto container = documents->container(*identifier);
  if (!container) return program.report(container.error(), failure);
  const auto listed = list(program, **container, options);
  if (listed) return ExitCode::done;
  return program.canWrite() ? program.report(listed.error(), failure) : ExitCode::failed;
}

}  // namespace mirabel
