#pragma once

#include <optional>
#include <string>

#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/IdentityStore.h"

namespace mirabel {

/// An entry on disk and what one look at it told. The descriptor is open on the folder as long as
/// this is used.
struct SeenObject {
  int directory = -1;
  std::string name;  ///< in `directory`; empty for the descriptor itself
  ObjectStatus status;
};

enum class Match { same, different };

/// Whether what is seen is the object of `row`. Costs a system call only where times cannot tell:
/// a settled change time that still stands proves it, as any object made later has a later one;
/// otherwise the kernel's handle decides, and where there are none, birth and change time.
[[nodiscard]] Match compare(const ObjectRow& row, const SeenObject& seen);

/// The file system of what is seen as rows note it: 0 for the volume itself, whose device number
/// is `volume`; else the kernel's own ID of what is mounted there, which outlasts device numbers.
/// POSIX errors.
[[nodiscard]] Result<std::uint64_t> fileSystemOf(const SeenObject& seen, std::uint64_t volume);

/// Looks again through a descriptor of the object itself, so that status and handle are surely
/// those of one object. POSIX errors.
struct PreciseLook {
  ObjectStatus status;
  std::string handle;  ///< empty where the file system has none
};
[[nodiscard]] Result<PreciseLook> lookPrecisely(int directory, const std::string& name);
[[nodiscard]] Match compare(const ObjectRow& row, const PreciseLook& look);

/// Copies the times and the size into the row, and decides whether its change time is settled.
void refresh(ObjectRow& row, const ObjectStatus& status);
/// Whether the object has changed since the row was written, as far as can be seen. The size is
/// looked at too: tmpfs gives a folder that loses an entry the time of that entry, which need not
/// be a new one.
[[nodiscard]] bool hasChanged(const ObjectRow& row, const ObjectStatus& status);
/// Whether the row differs from what `refresh` would make of it.
[[nodiscard]] bool isStale(const ObjectRow& row, const ObjectStatus& status);

[[nodiscard]] ObjectKind objectKind(FileKind kind, bool isPackage);

/// Whether `name` is what editors call the former version of `original` while they save:
/// "name~", "name.bak", "name.orig", "name.~1~", or any hidden name.
[[nodiscard]] bool isBackupName(std::string_view name, std::string_view original);
/// The same of two places, which must be in one folder.
[[nodiscard]] bool isBackupOf(const Location& place, const Location& original);

}  // namespace mirabel
