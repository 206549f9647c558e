#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>
#include <vector>

#include "cli/ItemArgument.h"
#include "cli/ItemCommands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

/// What would go with an item.
struct Contents {
  std::uint64_t entries = 0;
  std::uint64_t bytes = 0;

  void add(const ObjectStatus& status) {
    ++entries;
    if (status.kind == FileKind::regular) bytes += status.size;
  }
};

/// Counts what lies in a folder as a removal would find it: links are not followed, and other file
/// systems not entered.
class ContentsWalk {
 public:
  explicit ContentsWalk(UniqueFd top) : top_(std::move(top)) {}

  Result<void> run(Contents& contents) {
    pending_.emplace_back();
    while (!pending_.empty()) {
      const std::string path = std::move(pending_.back());
      pending_.pop_back();
      // From the top each time: one descriptor is enough for any depth.
      auto folder = openLongPath(top_.get(), path, O_RDONLY | O_DIRECTORY, resolveBeneath);
      if (!folder && (hasVanished(folder.error()) || folder.error().isPosix(EXDEV))) continue;
      if (!folder) return fail(folder.error());
      if (auto read = readFolder(path, RawDirectory(std::move(*folder)), contents); !read)
        return read;
    }
    return {};
  }

 private:
  static bool hasVanished(const Error& error) {
    return error.isPosix(ENOENT) || error.isPosix(ENOTDIR) || error.isPosix(ELOOP);
  }

  Result<void> readFolder(const std::string& path, RawDirectory folder, Contents& contents) {
    while (true) {
      const auto entry = folder.next();
      if (!entry) return fail(entry.error());
      if (!*entry) return {};
      const std::string name((*entry)->name);
      if (name == "." || name == "..") continue;
      const auto status = statusAt(folder.descriptor(), name);
      if (!status && hasVanished(status.error())) continue;
      if (!status && status.error().isPosix(EXDEV)) {
        ++contents.entries;  // a mount, whose server is gone
        continue;
      }
      if (!status) return fail(status.error());
      contents.add(*status);
      if (status->kind != FileKind::folder) continue;
      std::string& next = pending_.emplace_back(path);
      if (!path.empty()) next += '/';
      next += name;
    }
  }

  UniqueFd top_;
  std::vector<std::string> pending_;  ///< below the top
};

Result<Contents> contentsOf(const std::string& path) {
  const auto top = statusOf(path);
  if (!top) return fail(top.error());
  Contents contents;
  contents.add(*top);
  if (top->kind != FileKind::folder) return contents;
  auto folder = openLongPath(AT_FDCWD, path, O_PATH | O_DIRECTORY);
  if (!folder) return fail(folder.error());
  if (auto walked = ContentsWalk(std::move(*folder)).run(contents); !walked)
    return fail(walked.error());
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
  if (!found) return program.report(found.error(), "can't find " + named(item));
  if (isDryRun) return tellWhatWouldGo(program, *found);
  const auto error = OperationRun(program, *documents).error([&](auto done) {
    documents->remove(*found, std::move(done));
  });
  if (error) return program.report(*error, "can't remove " + named(item));
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
