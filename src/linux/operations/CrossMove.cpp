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
  if (auto allowed = mayBeTakenAway(item); !allowed) return allowed;
  if (context_.calls.status(folder.descriptor.get(), name)) return fail(Error::posix(EEXIST));
  auto copy = context_.pending.temporaryName(folder.path);
  if (!copy) return fail(copy.error());
  auto done = TreeCopy(context_.calls, context_.progress, CopyKind::move)
                  .run(item.folder.descriptor.get(), item.name, folder.descriptor.get(), *copy);
  auto record = done ? recordOf(item, folder, name, *copy) : fail(done.error());
  if (record) done = context_.pending.begin(*record);
  if (!record || !done) {
    removeTemporary(context_, folder, *copy);
    return fail(record ? done.error() : record.error());
  }
  done = exchange(item, folder, *copy, *record);
  // From here on the hidden item is nothing but something to be removed.
  context_.pending.end(*record);
  if (done) removeTemporary(context_, item.folder, record->hiddenSource);
  return done;
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
                                        const std::string& name, const std::string& copy) const {
  auto source = context_.calls.status(item.folder.descriptor.get(), item.name);
  auto made = context_.calls.status(folder.descriptor.get(), copy);
  if (!source || !made) return fail(source ? made.error() : source.error());
  auto hidden = context_.pending.temporaryName(item.folder.path);
  auto from = context_.pending.folderAt(item.folder.path);
  auto to = context_.pending.folderAt(folder.path);
  if (!hidden) return fail(hidden.error());
  if (!from || !to) return fail(from ? to.error() : from.error());
  return PendingMove{*std::move(from), item.name,  *std::move(hidden), *std::move(to), name,
                     source->inode,    made->inode};
}

Result<void> CrossMove::exchange(const ItemPlace& item, const OpenFolder& folder,
                                 const std::string& copy, const PendingMove& record) const {
  const FileCalls& calls = context_.calls;
  const int from = item.folder.descriptor.get();
  const int to = folder.descriptor.get();
  if (auto named = calls.rename(to, copy, to, record.name); !named) {
    removeTemporary(context_, folder, copy);
    return named;
  }
  auto done = syncFolder(context_, to);
  if (done) done = calls.rename(from, item.name, from, record.hiddenSource);
  if (!done) {
    takeBack(folder, record.name, copy);
    return done;
  }
  // Nobody comes by its name to it any more: what it is now is what has to be in the copy.
  const auto alike = looksAlike(calls, from, record.hiddenSource, to, record.name);
  if (!alike || !*alike) {
    if (auto back = calls.rename(from, record.hiddenSource, from, item.name); back)
      takeBack(folder, record.name, copy);
    return fail(alike ? Error::posix(EAGAIN, "it was changed while it was moved") : alike.error());
  }
  if (auto synced = syncFolder(context_, from); !synced)
    logError("can't synchronise \"" + item.folder.path + "\"; " + synced.error().description());
  return {};
}

void CrossMove::takeBack(const OpenFolder& folder, const std::string& name,
                         const std::string& copy) const {
  const int descriptor = folder.descriptor.get();
  if (context_.calls.rename(descriptor, name, descriptor, copy))
    removeTemporary(context_, folder, copy);
}

}  // namespace mirabel
