#include "linux/volume/ObjectMatcher.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/vfs.h>

#include "linux/kernel/LongPath.h"

namespace mirabel {
namespace {

bool isOfKind(ObjectKind kind, FileKind seen) {
  switch (seen) {
    case FileKind::regular:
      return kind == ObjectKind::regular;
    case FileKind::folder:
      return kind == ObjectKind::folder || kind == ObjectKind::package;
    case FileKind::symbolicLink:
      return kind == ObjectKind::symbolicLink;
    case FileKind::other:
      return kind == ObjectKind::other;
  }
  return false;
}

// What the times alone tell; nothing when the handle is needed.
std::optional<Match> compareTimes(const ObjectRow& row, const ObjectStatus& status) {
  if (!isOfKind(row.kind, status.kind)) return Match::different;
  if (row.birthTime != 0 && status.hasBirthTime && row.birthTime != status.birthTime) {
    return Match::different;
  }
  if (row.isSettled && row.changeTime == status.changeTime) return Match::same;
  return std::nullopt;
}

Match compareHandles(const ObjectRow& row, const ObjectStatus& status, std::string_view handle) {
  if (!row.handle.empty() && !handle.empty()) {
    return row.handle == handle ? Match::same : Match::different;
  }
  return status.changeTime < row.changeTime ? Match::different : Match::same;
}

Result<UniqueFd> openObject(int directory, const std::string& name) {
  UniqueFd object(
      ::openat(directory, name.empty() ? "." : name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
  if (!object) return fail(kernelError(errno));
  return object;
}

}  // namespace

Match compare(const ObjectRow& row, const SeenObject& seen) {
  if (auto decided = compareTimes(row, seen.status)) return *decided;
  std::optional<std::string> handle;
  if (!row.handle.empty()) handle = handleAt(seen.directory, seen.name);
  return compareHandles(row, seen.status, handle.value_or(""));
}

Match compare(const ObjectRow& row, const PreciseLook& look) {
  if (auto decided = compareTimes(row, look.status)) return *decided;
  return compareHandles(row, look.status, look.handle);
}

Result<PreciseLook> lookPrecisely(int directory, const std::string& name) {
  const auto object = openObject(directory, name);
  if (!object) return fail(object.error());
  auto status = statusAt(object->get(), "");
  if (!status) return fail(status.error());
  return PreciseLook{*status, handleAt(object->get(), "").value_or("")};
}

Result<std::uint64_t> fileSystemOf(const SeenObject& seen, std::uint64_t volume) {
  if (seen.status.device == volume) return 0;
  const auto object = openObject(seen.directory, seen.name);
  if (!object) return fail(object.error());
  struct statfs info;
  std::uint64_t id = 0;
  if (::fstatfs(object->get(), &info) == 0) {
    static_assert(sizeof(info.f_fsid) == sizeof(id));
    std::memcpy(&id, &info.f_fsid, sizeof(id));
  }
  return id != 0 ? id : seen.status.device;
}

void refresh(ObjectRow& row, const ObjectStatus& status) {
  const bool wasSettled = row.isSettled && row.changeTime == status.changeTime;
  row.birthTime = status.birthTime;
  row.changeTime = status.changeTime;
  row.isSettled = wasSettled || isSettled(status.changeTime, status.seenAt);
  row.modificationTime = status.modificationTime;
  row.size = status.size;
}

bool hasChanged(const ObjectRow& row, const ObjectStatus& status) {
  return row.changeTime != status.changeTime || row.size != status.size;
}

bool isStale(const ObjectRow& row, const ObjectStatus& status) {
  return hasChanged(row, status) || (!row.isSettled && isSettled(status.changeTime, status.seenAt));
}

ObjectKind objectKind(FileKind kind, bool isPackage) {
  switch (kind) {
    case FileKind::regular:
      return ObjectKind::regular;
    case FileKind::folder:
      return isPackage ? ObjectKind::package : ObjectKind::folder;
    case FileKind::symbolicLink:
      return ObjectKind::symbolicLink;
    case FileKind::other:
      return ObjectKind::other;
  }
  return ObjectKind::other;
}

bool isBackupName(std::string_view name, std::string_view original) {
  if (name == original) return false;
  if (name.starts_with('.') && !original.starts_with('.')) return true;
  if (!name.starts_with(original)) return false;
  const std::string_view suffix = name.substr(original.size());
  static constexpr std::array<std::string_view, 6> suffixes = {"~",     ".bak", ".BAK",
                                                               ".orig", ".old", ".backup"};
  if (std::ranges::find(suffixes, suffix) != suffixes.end()) return true;
  // Numbered backups: ".~12~".
  return suffix.size() > 3 && suffix.starts_with(".~") && suffix.ends_with('~') &&
         std::ranges::all_of(suffix.substr(2, suffix.size() - 3),
                             [](unsigned char c) { return std::isdigit(c) != 0; });
}

bool isBackupOf(const Location& place, const Location& original) {
  return place.folder == original.folder && isBackupName(place.name, original.name);
}

}  // namespace mirabel
