#include "linux/operations/CrossMove.h"

#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/Log.h"
#include "linux/operations/TreeComparison.h"
#include "linux/operations/TreeCopy.h"
#include "linux/operations/TreeRemoval.h"

namespace mirabel {

Result<void> CrossMove::run(const ItemPlace& item, const OpenFolder& folder,
                            const std::string& name) const {
  if (context_.calls.status(folder.descriptor.get(), name)) return fail(Error::posix(EEXIST));
  if (auto allowed = mayBeTakenAway(item); !allowed) return allowed;
  auto copy = context_.pending.temporaryName(folder.path);
  if (!copy) return fail(copy.error());
  auto done =
      TreeCopy(context_.calls, context_.progress, CopyKind::move)
          .run(item.folder.descriptor.get(), item.name, folder.descriptor.get(), copy->name);
  auto hidden = done ? context_.pending.temporaryName(item.folder.path) : fail(done.error());
  auto record = hidden ? recordOf(item, folder, name, *copy, *hidden) : fail(hidden.error());
  if (record) done = context_.pending.begin(*record);
  if (!record) done = fail(record.error());
  if (hidden && !done) context_.pending.isGone(*hidden);
  if (done) done = exchange(item, folder, copy->name, *hidden, *record);
  if (!done) {
    removeTemporary(context_, folder, *copy);
    return done;
  }
  context_.pending.isGone(*copy);
  // From here on the hidden item is nothing but something to be removed. Where that can't be noted,
  // the next start does it: what is half removed would look like something to be kept.
  if (context_.pending.end(*record)) removeTemporary(context_, item.folder, *hidden);
  return {};
}

/// Refused before anything is copied, since it could not be finished.
Result<void> CrossMove::mayBeTakenAway(const ItemPlace& item) const {
  const FileCalls& calls = context_.calls;
  const int folder = item.folder.descriptor.get();
  if (auto allowed = calls.mayChange(folder); !allowed) return allowed;
  const auto status = calls.status(folder, item.name);
  if (!status) return fail(status.error());
  if (status->kind != FileKind::folder) return {};
  auto top = calls.openBelow(folder, item.name, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!top) return fail(top.error());
  return TreeRemoval(calls, context_.progress).examine(top->get());
}

Result<PendingMove> CrossMove::recordOf(const ItemPlace& item, const OpenFolder& folder,
                                        const std::string& name, const TemporaryName& copy,
                                        const TemporaryName& hidden) const {
  auto made = pendingCopyAt(context_, folder.descriptor.get(), copy.name);
  if (!made) return fail(made.error());
  return PendingMove{hidden.folder, item.name, hidden.name, copy.folder, name, *std::move(made)};
}

/// After a failure the item has its name, and the copy has none.
Result<void> CrossMove::exchange(const ItemPlace& item, const OpenFolder& folder,
                                 const std::string& copy, const TemporaryName& hidden,
                                 const PendingMove& record) const {
  const FileCalls& calls = context_.calls;
  const int from = item.folder.descriptor.get();
  const int to = folder.descriptor.get();
  auto done = renameWithin(context_, from, item.name, hidden.name);
  if (!done) {
    context_.pending.isGone(hidden);
    static_cast<void>(context_.pending.end(record));
    return done;
  }
  done = compare(item, folder, copy, record);
  if (done) done = calls.rename(to, copy, to, record.name);
  if (done) {
    // The item goes only when it is known that its copy stays.
    if (auto synced = syncFolder(context_, to, Unreadable::refused); !synced) {
      done = synced;
      if (!calls.rename(to, record.name, to, copy)) return done;
    }
  }
  if (done) return {};
  if (giveNameBack(context_, item.folder, hidden.name, item.name)) {
    // Whatever still had the hidden name when the record is gone would be removed.
    if (forgetTemporary(context_, item.folder, hidden, Unreadable::refused))
      static_cast<void>(context_.pending.end(record));
  } else {
    logError("\"" + item.folder.url(item.name).path() +
             "\" has a hidden name until the next start");
  }
  return done;
}

Result<void> CrossMove::compare(const ItemPlace& item, const OpenFolder& folder,
                                const std::string& copy, const PendingMove& record) const {
  const auto alike = looksAlike(context_.calls, item.folder.descriptor.get(), record.hiddenSource,
                                folder.descriptor.get(), copy);
  if (!alike) return fail(alike.error());
  if (!*alike) return fail(Error::posix(EAGAIN, "it was changed while it was moved"));
  return {};
}

}  // namespace mirabel
