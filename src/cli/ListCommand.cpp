#include <algorithm>
#include <cerrno>
#include <limits>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>

#include "cli/Commands.h"
#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "fs/FSChangeToken.h"
#include "fs/FSDirectoryEnumerator.h"
#include "items/ItemBatch.h"

namespace mirabel {
namespace {

constexpr std::uint64_t pageSize = 200;
// Entries are read and identified this many at a time: one durable write for ten pages.
constexpr std::size_t readAhead = 10 * pageSize;

class PagePrinter {
 public:
  PagePrinter(Program& program, const Session& session, FSChangeToken cursor)
      : program_(program), session_(session), cursor_(cursor) {}

  /// Makes items of the entries, in order, and prints each page as it fills.
  Result<void> add(const std::vector<URL>& entries) {
    // The rest of a long folder is not read for nobody.
    if (!program_.canWrite()) return fail(Error::posix(EPIPE));
    const auto items = makeItems(session_.provider().itemContext(), entries);
    if (!items) return fail(items.error());
    for (const auto& item : *items) {
      // An entry that went away meanwhile, or is not shown, counts and makes no item.
      if (item) addItem(*item);
      if (++counted_ == pageSize) finishPage(true);
    }
    return {};
  }

  /// Prints the last page of the listing, which may be empty.
  void finish() { finishPage(false); }
  [[nodiscard]] std::string nextPage() const { return base64(stringView(cursor_.encode())); }

 private:
  void addItem(const LocalItem& item) {
    if (program_.options().json) {
      items_.push_back(itemJSON(item));
    } else {
      printRow(item);
    }
  }

  void printRow(const LocalItem& item) const {
    std::string size;
    if (item.documentSize()) size = humanSize(item.documentSize()->asUnsigned().value_or(0));
    if (item.childItemCount()) size = std::to_string(*item.childItemCount()) + " in it";
    std::string date;
    if (item.contentModificationDate()) date = humanDate(*item.contentModificationDate());
    std::string name = printable(item.filename());
    const bool isFolder = item.childItemCount().has_value();
    if (isFolder && program_.isTerminal()) name = "\033[1;34m" + name + "\033[0m";
    if (isFolder) name += '/';
    program_.out() << padded(std::move(size), 12, true) << "  "
                   << padded(std::move(date), 16, false) << "  "
                   << padded(printable(item.itemIdentifier()), 14, false) << "  " << name << '\n';
  }

  static std::string padded(std::string text, std::size_t width, bool atLeft) {
    const std::size_t has = displayWidth(text);
    if (has >= width) return text;
    return atLeft ? std::string(width - has, ' ') + text : text + std::string(width - has, ' ');
  }

  void finishPage(bool more) {
    cursor_.offset += std::exchange(counted_, 0);
    if (!program_.options().json) return;
    nlohmann::json line;
    line["items"] = std::exchange(items_, nlohmann::json::array());
    line["nextPage"] = nullptr;
    if (more) line["nextPage"] = nextPage();
    program_.out() << line.dump() << '\n';
  }

  Program& program_;
  const Session& session_;
  FSChangeToken cursor_;
  std::uint64_t counted_ = 0;
  nlohmann::json items_ = nlohmann::json::array();
};

Result<FSChangeToken> cursorFor(const Session& session, const URL& folder,
                                const std::optional<std::string>& page) {
  auto history = session.platform().history.historyUUID(folder);
  if (!history) return fail(Error::local(LocalVesselError::unableToGetDeviceUUID));
  if (!page) {
    FSChangeToken cursor;
    cursor.deviceUUID = *history;
    return cursor;
  }
  const auto bytes = fromBase64(*page);
  if (!bytes) return fail(Error::syncAnchorExpired());
  const Data data = dataFromString(*bytes);
  const auto cursor = FSChangeToken::decode(std::span<const std::uint8_t>(data));
  if (!cursor || cursor->deviceUUID != *history) return fail(Error::syncAnchorExpired());
  return *cursor;
}

Result<void> list(Program& program, const Session& session, const ListOptions& options,
                  const URL& folder) {
  auto cursor = cursorFor(session, folder, options.page);
  if (!cursor) return fail(cursor.error());
  constexpr std::uint64_t all = std::numeric_limits<std::uint64_t>::max();
  const std::uint64_t pages = options.pages.value_or(all);
  FSDirectoryEnumerator walker;
  walker.urls = {folder};
  walker.offset = cursor->offset;
  walker.limit = pages > all / pageSize ? all : pages * pageSize;

  PagePrinter printer(program, session, *cursor);
  std::vector<URL> batch;
  std::uint64_t seen = 0;
  const std::size_t batchSize = std::min<std::uint64_t>(readAhead, walker.limit);
  const auto visit = [&](const URL& url) -> Result<void> {
    batch.push_back(url);
    ++seen;
    if (batch.size() < batchSize) return {};
    return printer.add(std::exchange(batch, {}));
  };
  auto counted =
      walker.enumerate(session.platform().directories, session.platform().resources, visit);
  if (!counted) return fail(counted.error());
  if (auto added = printer.add(batch); !added) return added;
  if (seen < walker.limit) {
    printer.finish();
    return {};
  }
  // It stopped because it had its pages, and has printed the last one already.
  if (!program.options().json) program.note("it goes on with --page " + printer.nextPage());
  return {};
}

}  // namespace

ExitCode runList(Program& program, const ListOptions& options) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  auto item = ItemArgument(options.item).item(*session);
  if (!item) return program.report(item.error(), "can't find " + options.item);
  const URL folder = (*item)->fileURL();
  auto kind = ResourceReader(session->platform().resources).value(ResourceKey::isDirectory, folder);
  if (!kind) return program.report(kind.error(), "can't list " + options.item);
  if (kind->index() == 0 || !std::get<bool>(*kind)) {
    return program.report(Error::posix(ENOTDIR), "can't list " + options.item);
  }
  if (auto listed = list(program, *session, options, folder); !listed) {
    if (!program.canWrite()) return ExitCode::failed;
    return program.report(listed.error(), "can't list " + options.item);
  }
  return ExitCode::done;
}

}  // namespace mirabel
