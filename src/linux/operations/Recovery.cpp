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
    context_.pending.settle(remaining);
    // What a move still needs lies among what would be removed.
    if (!remaining.moves.empty()) return;
    std::erase_if(remaining.removals, [this](const PendingRemovals& removals) {
      return finish(removals) == Outcome::done;
    });
    context_.pending.settle(std::move(remaining));
  }

 private:
  /// Where the folder lies now. ENOENT only where it is not to be found for good.
  Result<OpenFolder> open(const PendingFolder& folder) {
    const auto path = index_.pathOfFileID(folder.fileID);
    if (path) return openFolder(context_, URL::fileURL(*path));
    auto opened = openFolder(context_, URL::fileURL(folder.path));
    if (opened || !opened.error().isPosix(ENOENT)) return opened;
    // A root that is not there may only be not mounted.
    const auto root = context_.roots.locate(folder.path);
    const bool isMissing = root && context_.roots.descriptor(root->root) < 0;
    return fail(Error::posix(isMissing ? ENODEV : ENOENT));
  }

  static Outcome outcomeOf(const Error& error) {
    return error.isPosix(ENOENT) ? Outcome::done : Outcome::notYet;
  }

  bool isThere(const OpenFolder& folder, const std::string& name) {
    return calls_.status(folder.descriptor.get(), name).has_value();
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
    if (!isThere(*folder, rename.hidden)) return Outcome::done;
    const int descriptor = folder->descriptor.get();
    for (const std::string& name :
         {rename.to, rename.from, numberedName(rename.to, 2, NameOf::file)}) {
      if (calls_.rename(descriptor, rename.hidden, descriptor, name)) return Outcome::done;
    }
    return Outcome::notYet;
  }

  Outcome finish(const PendingMove& move) {
    auto target = open(move.folder);
    auto source = open(move.sourceFolder);
    if (!target || !source) return outcomeOf(target ? source.error() : target.error());
    const auto copy = calls_.status(target->descriptor.get(), move.name);
    const bool isNamed = copy && copy->inode == move.copyInode;
    if (isThere(*source, move.hiddenSource)) return finishHidden(move, *source, *target, isNamed);
    const auto item = calls_.status(source->descriptor.get(), move.sourceName);
    if (!isNamed || !item || item->inode != move.sourceInode) return Outcome::done;
    if (!isLike(*source, move.sourceName, *target, move.name)) return Outcome::done;
    const int descriptor = source->descriptor.get();
    auto hidden = calls_.rename(descriptor, move.sourceName, descriptor, move.hiddenSource);
    return hidden ? Outcome::done : Outcome::notYet;
  }

  /// The item is hidden, and stays so when its copy is like it; else it gets its name back.
  Outcome finishHidden(const PendingMove& move, const OpenFolder& source, const OpenFolder& target,
                       bool isNamed) {
    if (isNamed && isLike(source, move.hiddenSource, target, move.name)) return Outcome::done;
    const int descriptor = source.descriptor.get();
    for (const std::string& name :
         {move.sourceName, numberedName(move.sourceName, 2, NameOf::file)}) {
      if (calls_.rename(descriptor, move.hiddenSource, descriptor, name)) return Outcome::done;
    }
    return Outcome::notYet;
  }

  bool isLike(const OpenFolder& source, const std::string& name, const OpenFolder& target,
              const std::string& copy) {
    return looksAlike(calls_, source.descriptor.get(), name, target.descriptor.get(), copy)
        .value_or(false);
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
