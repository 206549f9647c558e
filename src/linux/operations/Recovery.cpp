#include "linux/operations/Recovery.h"

#include <cerrno>
#include <utility>
#include <vector>

#include "foundation/Log.h"
#include "linux/operations/TreeComparison.h"

namespace mirabel {
namespace {

enum class Outcome { done, notYet };

class OperationRecovery {
 public:
  OperationRecovery(const OperationContext& context, VolumeIndex& index)
      : context_(context), calls_(context.calls), index_(index) {}

  void run() {
    const PendingRecords found = context_.pending.load();
    if (found.isEmpty()) return;
    PendingRecords remaining;
    // The moves first: what they hide is to be removed only when it is known that it may be.
    for (const PendingMove& move : found.moves) {
      if (finish(move) == Outcome::notYet) remaining.moves.push_back(move);
    }
    for (const PendingRename& rename : found.renames) {
      if (finish(rename) == Outcome::notYet) remaining.renames.push_back(rename);
    }
    remaining.removals = found.removals;
    const auto noted = context_.pending.settle(remaining);
    // What a move still needs lies among what would be removed; and where that it is done is not
    // noted, the next start must find whole what it looks at once more.
    if (!noted || !remaining.moves.empty()) return;
    std::erase_if(remaining.removals, [this](const PendingRemovals& removals) {
      return finish(removals) == Outcome::done;
    });
    static_cast<void>(context_.pending.settle(std::move(remaining)));
  }

 private:
  /// Where the folder lies now. ENOENT where it is not to be found, ENODEV where its root is not
  /// there, which may only be not mounted.
  Result<OpenFolder> open(const PendingFolder& folder) {
    const auto path = index_.pathOfFileID(folder.fileID);
    if (path) return openFolder(context_, URL::fileURL(*path));
    if (!path.error().isPosix(ENOENT)) return fail(path.error());
    const auto root = context_.roots.locate(folder.path);
    if (root && !context_.roots.isThere(root->rootPath)) return fail(Error::posix(ENODEV));
    return openFolder(context_, URL::fileURL(folder.path));
  }

  static Outcome outcomeOf(const Error& error) {
    return error.isPosix(ENOENT) ? Outcome::done : Outcome::notYet;
  }

  /// The error is that it can't be told.
  Result<bool> isThere(const OpenFolder& folder, const std::string& name) {
    const auto status = calls_.status(folder.descriptor.get(), name);
    if (!status && !status.error().isPosix(ENOENT)) return fail(status.error());
    return status.has_value();
  }

  Outcome finish(const PendingRemovals& removals) {
    auto folder = open(removals.folder);
    if (!folder) return outcomeOf(folder.error());
    auto entries = entriesOf(calls_, folder->descriptor.get());
    if (!entries) return Outcome::notYet;
    Outcome outcome = Outcome::done;
    for (const FolderEntry& entry : *entries) {
      if (!entry.name.starts_with(removals.prefix)) continue;
      auto removed = removeWhole(context_, folder->descriptor.get(), entry.name);
      if (removed) continue;
      outcome = Outcome::notYet;
      logError("can't remove \"" + folder->url(entry.name).path() + "\" yet; " +
               removed.error().description());
    }
    return outcome;
  }

  Outcome finish(const PendingRename& rename) {
    auto folder = open(rename.folder);
    if (!folder) return outcomeOf(folder.error());
    const auto isHidden = isThere(*folder, rename.hidden);
    if (!isHidden) return Outcome::notYet;
    if (!*isHidden) return Outcome::done;
    const int descriptor = folder->descriptor.get();
    if (calls_.rename(descriptor, rename.hidden, descriptor, rename.to)) return Outcome::done;
    return givenBack(*folder, rename.hidden, rename.from);
  }

  /// The copy gets its name only when it is known to be like the item: where it has it and still
  /// is, the item is but something to be removed. Where it is not, both stay.
  Outcome finish(const PendingMove& move) {
    auto source = open(move.sourceFolder);
    if (!source) return outcomeOf(source.error());
    const auto isHidden = isThere(*source, move.hiddenSource);
    if (!isHidden) return Outcome::notYet;
    if (!*isHidden) return Outcome::done;
    const auto replaced = isReplaced(*source, move);
    if (!replaced) return Outcome::notYet;
    if (*replaced) return Outcome::done;
    return givenBack(*source, move.hiddenSource, move.sourceName);
  }

  /// Whether the copy has its name, and nobody has changed it or the item since they were compared.
  Result<bool> isReplaced(const OpenFolder& source, const PendingMove& move) {
    auto target = open(move.folder);
    if (!target && (target.error().isPosix(ENOENT) || target.error().isPosix(ENODEV))) return false;
    if (!target) return fail(target.error());
    const int folder = target->descriptor.get();
    const auto named = pendingCopyAt(context_, folder, move.name);
    if (!named && named.error().isPosix(ENOENT)) return false;
    if (!named) return fail(named.error());
    if (*named != move.copy) return false;
    return looksAlike(calls_, source.descriptor.get(), move.hiddenSource, folder, move.name);
  }

  Outcome givenBack(const OpenFolder& folder, const std::string& hidden, const std::string& name) {
    return giveNameBack(context_, folder, hidden, name) ? Outcome::done : Outcome::notYet;
  }

  const OperationContext& context_;
  const FileCalls& calls_;
  VolumeIndex& index_;
};

}  // namespace

void recoverOperations(const OperationContext& context, VolumeIndex& index) {
  OperationRecovery(context, index).run();
}

}  // namespace mirabel
