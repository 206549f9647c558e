#include "linux/operations/ItemRemoval.h"

#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/Log.h"
#include "linux/operations/TreeRemoval.h"

namespace mirabel {
namespace {

class FolderRemoval {
 public:
  FolderRemoval(const OperationContext& context, const ItemPlace& item, UniqueFd top)
      : context_(context),
        item_(item),
        top_(std::move(top)),
        removal_(context.calls, context.progress) {}

  Result<void> run() {
    if (auto examined = removal_.examine(top_.get()); !examined) return examined;
    auto hidden = context_.pending.temporaryName(item_.folder.path);
    auto taken = hidden ? rename(item_.name, hidden->name) : fail(hidden.error());
    if (hidden && !taken) context_.pending.isGone(*hidden);
    // Whoever removes something on a full disk wants to make room.
    if (!taken && isFull(taken.error())) return removeInPlace();
    if (!taken) return taken;
    if (auto same = isExamined(hidden->name); !same) {
      if (giveNameBack(context_, item_.folder, hidden->name, item_.name)) {
        static_cast<void>(forgetTemporary(context_, item_.folder, *hidden));
      } else {
        logError("can't give \"" + item_.folder.url(item_.name).path() + "\" its name back");
      }
      return same;
    }
    auto done = syncFolder(context_, item_.folder.descriptor.get());
    if (done) done = emptyAndRemove(hidden->name);
    if (done) {
      // It is gone already as far as anybody can see.
      static_cast<void>(forgetTemporary(context_, item_.folder, *hidden));
      return {};
    }
    // Nothing in it is removed: it gets its name back, unless that was given away meanwhile.
    if (!removal_.hasRemoved() && rename(hidden->name, item_.name)) {
      static_cast<void>(forgetTemporary(context_, item_.folder, *hidden));
      return done;
    }
    logError("what was in \"" + item_.folder.url(item_.name).path() +
             "\" is not all removed yet; " + done.error().description());
    return {};
  }

 private:
  static bool isFull(const Error& error) {
    return error.isPosix(ENOSPC) || error.isPosix(EDQUOT) || error.domain == ErrorDomain::store;
  }

  /// Somebody may have put another folder under the name since it was looked at.
  [[nodiscard]] Result<void> isExamined(const std::string& name) const {
    const auto named = context_.calls.status(item_.folder.descriptor.get(), name);
    const auto examined = context_.calls.status(top_.get());
    if (!named || !examined) return fail(named ? examined.error() : named.error());
    if (named->inode == examined->inode && named->device == examined->device) return {};
    return fail(Error::posix(EAGAIN, "it was replaced while it was deleted"));
  }

  [[nodiscard]] Result<void> rename(const std::string& from, const std::string& to) const {
    const int folder = item_.folder.descriptor.get();
    return context_.calls.rename(folder, from, folder, to);
  }

  Result<void> removeInPlace() {
    if (auto removed = emptyAndRemove(item_.name); !removed) return removed;
    return syncFolder(context_, item_.folder.descriptor.get());
  }

  Result<void> emptyAndRemove(const std::string& name) {
    if (auto emptied = removal_.run(top_.get()); !emptied) return emptied;
    const int folder = item_.folder.descriptor.get();
    if (auto removed = context_.calls.remove(folder, name, AT_REMOVEDIR); !removed) return removed;
    context_.progress.entriesRemoved.fetch_add(1, std::memory_order_relaxed);
    return {};
  }

  const OperationContext& context_;
  const ItemPlace& item_;
  UniqueFd top_;
  TreeRemoval removal_;
};

}  // namespace

Result<void> removeItem(const OperationContext& context, const URL& item) {
  auto place = itemPlaceOf(context, item);
  if (!place) return fail(place.error());
  const FileCalls& calls = context.calls;
  const int folder = place->folder.descriptor.get();
  const auto status = calls.status(folder, place->name);
  if (!status) return fail(status.error());
  if (status->kind == FileKind::folder) {
    auto top =
        calls.openBelow(folder, place->name, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
    if (!top) return fail(top.error());
    return FolderRemoval(context, *place, std::move(*top)).run();
  }
  if (auto removed = calls.remove(folder, place->name, 0); !removed) return removed;
  context.progress.entriesRemoved.fetch_add(1, std::memory_order_relaxed);
  return syncFolder(context, folder);
}

}  // namespace mirabel
