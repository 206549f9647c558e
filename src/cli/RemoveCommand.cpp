#include <cstdint>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <ostream>
#include <system_error>

#include "cli/ItemArgument.h"
#include "cli/ItemCommands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

/// What would go with an item.
struct Contents {
  std::uint64_t entries = 0;
  std::uint64_t bytes = 0;
};

void count(const fs::directory_entry& entry, Contents& contents) {
  std::error_code ignored;
  ++contents.entries;
  if (entry.is_regular_file(ignored) && !entry.is_symlink(ignored)) {
    const auto size = entry.file_size(ignored);
    if (!ignored) contents.bytes += size;
  }
}

Result<Contents> contentsOf(const std::string& path) {
  std::error_code failure;
  Contents contents;
  const fs::directory_entry top(path, failure);
  if (!failure) count(top, contents);
  if (failure || top.is_symlink(failure) || !top.is_directory(failure)) {
    if (failure) return fail(Error::posix(failure.value()));
    return contents;
  }
  for (auto entry = fs::recursive_directory_iterator(path, failure);
       !failure && entry != fs::recursive_directory_iterator(); entry.increment(failure)) {
    count(*entry, contents);
  }
  if (failure) return fail(Error::posix(failure.value()));
  return contents;
}

ExitCode tellWhatWouldGo(Program& program, const ItemRecord& item) {
  const std::string& path = item.path;
  const auto contents = contentsOf(path);
  if (!contents) return program.report(contents.error(), "can't look at all of " + path);
  if (program.options().json) {
    nlohmann::json line;
    setText(line, "wouldDelete", item.itemIdentifier);
    setText(line, "path", path);
    line["entries"] = contents->entries;
    line["bytes"] = std::to_string(contents->bytes);
    program.out() << line.dump() << '\n';
  } else {
    program.out() << "would remove " << printable(item.itemIdentifier) << "  " << printable(path)
                  << "  (" << contents->entries
                  << (contents->entries == 1 ? " entry, " : " entries, ")
                  << humanSize(contents->bytes) << ")\n";
  }
  return ExitCode::done;
}

ExitCode removeOne(Program& program, const std::string& item, bool isDryRun) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto found = ItemArgument(item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + item);
  if (isDryRun) return tellWhatWouldGo(program, *found);
  const auto error = OperationRun(program, *documents).error([&](auto done) {
    documents->remove(*found, std::move(done));
  });
  if (error) return program.report(*error, "can't remove " + item);
  if (program.options().json) {
    program.out() << nlohmann::json{{"deleted", {utf8Lossy(found->itemIdentifier)}}}.dump() << '\n';
  } else {
    program.out() << "removed " << printable(found->itemIdentifier) << "  "
                  << printable(found->path) << '\n';
  }
  return ExitCode::done;
}

}  // namespace

ExitCode runRemove(Program& program, const RemoveOptions& options) {
  Outcomes outcomes;
  for (const std::string& item : options.items)
    outcomes.add(removeOne(program, item, options.isDryRun));
  return outcomes.exitCode();
}

}  // namespace mirabel
