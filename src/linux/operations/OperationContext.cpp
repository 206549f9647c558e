#include "linux/operations/OperationContext.h"

#include <cerrno>
#include <fcntl.h>

#include "foundation/Log.h"
#include "linux/operations/TreeRemoval.h"
#include "platform/FileOperations.h"

namespace mirabel {

Result<ItemPlace> itemPlaceOf(const OperationContext& context, const URL& item) {
  auto place = placeOf(context.roots, item);
  if (!place) return fail(place.error());
  if (place->name.empty()) {
    const auto root = context.roots.locate(item.path());
    std::string why = "it is not something in the documents that can be changed";
    if (root && root->relative.empty()) {
      const bool isStorage = root->rootPath == context.roots.firstPath();
      why = isStorage ? "the root itself can't be changed"
                      : "the folder of an app library can't be changed itself; it comes and goes "
                        "with its application";
    }
    return fail(Error::posix(EPERM, why));
  }
  return ItemPlace{{std::move(place->folder), std::move(place->folderPath)},
                   std::move(place->name)};
}

Result<OpenFolder> openFolder(const OperationContext& context, const URL& url) {
  if (!url.isFileURL() || url.path().empty()) return fail(Error::posix(EINVAL));
  if (auto checked = context.calls.check("open folder"); !checked) return fail(checked.error());
  if (!context.roots.locate(url.path())) {
    return fail(Error::posix(EPERM, "it is not a folder of the documents"));
  }
  auto opened = context.roots.open(url.path(), O_PATH | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  return OpenFolder{std::move(*opened), url.path()};
}

Result<void> syncFolder(const OperationContext& context, int folder, Unreadable unreadable) {
  auto opened = context.calls.open(folder, ".", O_RDONLY | O_DIRECTORY);
  const bool isPassedOver = unreadable == Unreadable::passedOver;
  if (!opened && isPassedOver && opened.error().isPosix(EACCES)) return {};
  if (!opened) return fail(opened.error());
  return context.calls.sync(opened->get());
}

Result<void> renameWithin(const OperationContext& context, int folder, const std::string& from,
                          const std::string& to) {
  auto renamed = context.calls.rename(folder, from, folder, to);
  if (renamed || !renamed.error().isPosix(EXDEV)) return renamed;
  return fail(Error::posix(ENOTSUP, "it can't be renamed on this kind of file system"));
}

Result<bool> liesWithin(const OperationContext& context, int folder, const ObjectStatus& object) {
  const FileCalls& calls = context.calls;
  UniqueFd current;
  for (int descriptor = folder;;) {
    const auto here = calls.status(descriptor);
    if (!here) return fail(here.error());
    if (here->inode == object.inode && here->device == object.device) return true;
    auto parent = calls.open(descriptor, "..", O_PATH | O_DIRECTORY);
    if (!parent) return fail(parent.error());
    const auto above = calls.status(parent->get());
    if (!above) return fail(above.error());
    if (above->inode == here->inode && above->device == here->device) return false;
    current = std::move(*parent);
    descriptor = current.get();
  }
}

Error operationError(Error error, const URL& url) {
  return error.isPosix(EEXIST) ? fileExists(url) : std::move(error);
}

NameOf kindOfName(const OperationContext& context, const ObjectStatus& status,
                  std::string_view name) {
  const bool isPlainFolder = status.kind == FileKind::folder && !context.isPackageName(name);
  return isPlainFolder ? NameOf::plainFolder : NameOf::file;
}

Result<PendingCopy> pendingCopyAt(const OperationContext& context, int folder,
                                  const std::string& name) {
  const auto status = context.calls.status(folder, name);
  if (!status) return fail(status.error());
  return PendingCopy{status->inode, handleAt(folder, name).value_or(""),
                     static_cast<std::uint64_t>(status->birthTime)};
}

bool giveNameBack(const OperationContext& context, const OpenFolder& folder,
                  const std::string& hidden, const std::string& name) {
  constexpr std::uint64_t mostTried = 100;
  const int descriptor = folder.descriptor.get();
  auto done = context.calls.rename(descriptor, hidden, descriptor, name);
  for (std::uint64_t number = 2; !done && number < mostTried; ++number) {
    if (!done.error().isPosix(EEXIST)) return false;
    done = context.calls.rename(descriptor, hidden, descriptor,
                                numberedName(name, number, NameOf::file));
  }
  return done.has_value();
}

Result<void> removeWhole(const OperationContext& context, int folder, const std::string& name) {
  const FileCalls& calls = context.calls;
  const auto status = calls.status(folder, name);
  if (!status) return fail(status.error());
  if (status->kind != FileKind::folder) return calls.remove(folder, name, 0);
  auto top = calls.openBelow(folder, name, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
  if (!top) return fail(top.error());
  TreeRemoval removal(calls, context.progress);
  if (auto examined = removal.examine(top->get()); !examined) return examined;
  if (auto emptied = removal.run(top->get()); !emptied) return emptied;
  return calls.remove(folder, name, AT_REMOVEDIR);
}

void removeTemporary(const OperationContext& context, const OpenFolder& folder,
                     const TemporaryName& temporary) {
  auto removed = removeWhole(context, folder.descriptor.get(), temporary.name);
  if (removed || removed.error().isPosix(ENOENT)) {
    static_cast<void>(forgetTemporary(context, folder, temporary));
    return;
  }
  logError("can't remove \"" + folder.url(temporary.name).path() + "\" yet; " +
           removed.error().description());
}

Result<void> forgetTemporary(const OperationContext& context, const OpenFolder& folder,
                             const TemporaryName& temporary, Unreadable unreadable) {
  auto synced = syncFolder(context, folder.descriptor.get(), unreadable);
  if (synced) context.pending.isGone(temporary);
  return synced;
}

}  // namespace mirabel
