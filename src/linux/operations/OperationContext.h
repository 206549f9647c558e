#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "foundation/URL.h"
#include "linux/kernel/EntryPlace.h"
#include "linux/kernel/MonitoredRoots.h"
#include "linux/operations/FileCalls.h"
#include "linux/operations/ItemNames.h"
#include "linux/operations/OperationProgress.h"
#include "linux/operations/PendingWork.h"
#include "mirabel/Error.h"

namespace mirabel {

/// What operations work with; all of it outlives them.
struct OperationContext {
  const MonitoredRoots& roots;
  const FileCalls& calls;
  PendingWork& pending;
  OperationProgress& progress;
  std::function<bool(std::string_view name)> isPackageName;
};

/// A folder that is held open, and its path.
struct OpenFolder {
  UniqueFd descriptor;  ///< O_PATH
  std::string path;

  [[nodiscard]] URL url(const std::string& name) const {
    return URL::fileURL(path).appendingPathComponent(name);
  }
};

/// Where an item lies that is to be changed. EPERM for a root and for what lies outside the roots,
/// which are nobody's to change here; the errors of `placeOf`.
struct ItemPlace {
  OpenFolder folder;
  std::string name;
};
[[nodiscard]] Result<ItemPlace> itemPlaceOf(const OperationContext& context, const URL& item);

/// Opens the folder at `url`, beneath its root. POSIX errors, EPERM for one outside the roots.
[[nodiscard]] Result<OpenFolder> openFolder(const OperationContext& context, const URL& url);

/// Has the names in an open folder on disk. One that may not be read can't be synchronised, which
/// is an error only where something depends on it.
enum class Unreadable { passedOver, refused };
[[nodiscard]] Result<void> syncFolder(const OperationContext& context, int folder,
                                      Unreadable unreadable = Unreadable::passedOver);

/// Gives an entry of a folder another name there. ENOTSUP for a folder on a file system that can't:
/// one that is put together of several, and would have to copy it.
[[nodiscard]] Result<void> renameWithin(const OperationContext& context, int folder,
                                        const std::string& from, const std::string& to);

/// Whether the open folder is the object with that status, or lies below it.
[[nodiscard]] Result<bool> liesWithin(const OperationContext& context, int folder,
                                      const ObjectStatus& object);

/// Takes the error of a call for the operation's own: `fileExists` for EEXIST at `url`.
[[nodiscard]] Error operationError(Error error, const URL& url);

/// How the name of what has this status is divided.
[[nodiscard]] NameOf kindOfName(const OperationContext& context, const ObjectStatus& status,
                                std::string_view name);

/// What the copy at (`folder`, `name`) is to be known by.
[[nodiscard]] Result<PendingCopy> pendingCopyAt(const OperationContext& context, int folder,
                                                const std::string& name);

/// Gives what has a hidden name its own, or one made from it where that is taken.
[[nodiscard]] bool giveNameBack(const OperationContext& context, const OpenFolder& folder,
                                const std::string& hidden, const std::string& name);

/// Removes what lies at (`folder`, `name`), a folder with everything in it.
[[nodiscard]] Result<void> removeWhole(const OperationContext& context, int folder,
                                       const std::string& name);
/// The same for what has such a name, if anything has; what can't be removed is left to the next
/// start, with a line in the log.
void removeTemporary(const OperationContext& context, const OpenFolder& folder,
                     const TemporaryName& temporary);
/// Nothing has the name any more: so it is on disk, or else the next start looks once more.
Result<void> forgetTemporary(const OperationContext& context, const OpenFolder& folder,
                             const TemporaryName& temporary,
                             Unreadable unreadable = Unreadable::passedOver);

}  // namespace mirabel
