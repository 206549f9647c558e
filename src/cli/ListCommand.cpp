#include <cerrno>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>

#include "cli/Commands.h"
#include "cli/ContainerArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "items/LocalItem.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {
namespace {

/// One page, as the enumerator hands it over.
class Page final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& enumerated) override {
    items.insert(items.end(), enumerated.begin(), enumerated.end());
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& nextPage) override { next = nextPage; }
  void finishEnumeratingWithError(const Error& failure) override { error = failure; }

  VesselItems items;
  std::optional<Data> next;
  std::optional<Error> error;
};

void printRow(const Program& program, const LocalItem& item) {
  std::string size;
  if (item.documentSize()) size = humanSize(item.documentSize()->asUnsigned().value_or(0));
  if (item.childItemCount()) size = std::to_string(*item.childItemCount()) + " in it";
  std::string date;
  if (item.contentModificationDate()) date = humanDate(*item.contentModificationDate());
  std::string name = printable(item.filename());
  const bool isFolder = item.childItemCount().has_value();
  if (isFolder && program.isTerminal()) name = "\033[1;34m" + name + "\033[0m";
  if (isFolder) name += '/';
  program.out() << padded(std::move(size), 12, Align::right) << "  "
                << padded(std::move(date), 16, Align::left) << "  "
                << padded(printable(item.itemIdentifier()), 14, Align::left) << "  " << name
                << '\n';
}

std::string textOf(const Data& cursor) {
  return base64(stringView(cursor));
}

void print(const Program& program, const Page& page) {
  if (!program.options().json) {
    for (const auto& item : page.items)
      printRow(program, *item);
    return;
  }
  nlohmann::json line;
  line["items"] = nlohmann::json::array();
  for (const auto& item : page.items)
    line["items"].push_back(itemJSON(*item));
  line["nextPage"] = nullptr;
  if (page.next) line["nextPage"] = textOf(*page.next);
  program.out() << line.dump() << '\n';
}

Result<Data> startOf(const ListOptions& options) {
  if (!options.page) return dataFromString(VesselInitialPageSortedByName);
  const auto bytes = fromBase64(*options.page);
  if (!bytes) return fail(Error::syncAnchorExpired());
  return dataFromString(*bytes);
}

Result<void> list(Program& program, VesselEnumerator& enumerator, const ListOptions& options) {
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
    Page page;
    enumerator.enumerateItems(page, *next);
    if (page.error) return fail(*page.error);
    print(program, page);
    next = std::move(page.next);
  }
  return {};
}

Result<void> requireFolder(const Session& session, const Container& container) {
  if (!container.folder) return {};
  const ResourceReader reader(session.platform().resources);
  auto isFolder = reader.value(ResourceKey::isDirectory, *container.folder);
  if (!isFolder) return fail(isFolder.error());
  if (*isFolder != ResourceValue(true)) return fail(Error::posix(ENOTDIR));
  return {};
}

}  // namespace

ExitCode runList(Program& program, const ListOptions& options) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const auto container = ContainerArgument(options.item).container(*session);
  if (!container) return program.report(container.error(), "can't find " + options.item);
  const std::string failure = "can't list " + options.item;
  if (auto folder = requireFolder(*session, *container); !folder) {
    return program.report(folder.error(), failure);
  }
  const auto enumerator = session->enumerator(container->identifier);
  if (!enumerator) return program.report(enumerator.error(), failure);
  const auto listed = list(program, **enumerator, options);
  (*enumerator)->invalidate();
  if (listed) return ExitCode::done;
  return program.canWrite() ? program.report(listed.error(), failure) : ExitCode::failed;
}

}  // namespace mirabel
