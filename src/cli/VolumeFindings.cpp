#include "cli/VolumeFindings.h"

#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <utility>

#include "cli/Printing.h"
#include "host/ErrorText.h"
#include "linux/kernel/LongPath.h"
#include "linux/volume/FollowStatus.h"
#include "linux/volume/VolumeAbilities.h"

namespace mirabel {
namespace {

constexpr const char* betterVolume = "keep documents on ext4, xfs, btrfs or tmpfs";

Finding attributesFinding(const Result<void>& tried) {
  const std::string subject = "extended attributes";
  if (tried) return {subject, Health::good, "the volume keeps user attributes", ""};
  const Error& error = tried.error();
  if (error.isPosix(EOPNOTSUPP) || error.isPosix(EPERM)) {
    return {subject, Health::bad,
            "the volume keeps no user attributes: tags, favourites, dates of use and where a "
            "trashed item came from can't be kept; identities last all the same",
            "use a file system that has them, and mount it without \"nouser_xattr\""};
  }
  if (error.isPosix(ENOSPC) || error.isPosix(EDQUOT)) {
    return {subject, Health::limited, "could not be tried: nothing more can be written there",
            "delete something there"};
  }
  return {subject, Health::limited, "could not be tried: " + explanation(error),
          "make the document storage writable"};
}

Finding birthTimeFinding(bool has) {
  const std::string subject = "birth times";
  if (has) return {subject, Health::good, "the volume tells when a file was made", ""};
  return {subject, Health::limited,
          "the volume does not tell when a file was made: creation dates are absent, and every "
          "question about an item takes a look at the disk",
          betterVolume};
}

Finding handleFinding(bool has, bool hasBirthTimes) {
  const std::string subject = "file handles";
  if (has) {
    return {subject, Health::good,
            "the volume tells a new file from a deleted one with the same inode number", ""};
  }
  return {subject, hasBirthTimes ? Health::limited : Health::bad,
          "the volume gives no file handles: a new file with a used inode number is recognised by "
          "its times alone",
          betterVolume};
}

Finding uuidFinding(bool has) {
  const std::string subject = "volume UUID";
  if (has) return {subject, Health::good, "the volume has one of its own", ""};
  return {subject, Health::limited,
          "the volume has none, or the kernel does not tell it; one is made from the file system's "
          "ID, and identities last as long as that stays",
          "use a kernel of 6.9 or later, and ext4, xfs or btrfs"};
}

constexpr const char* withoutWatching =
    ": every question about changes is answered by a look at all files";

Result<FollowStatus> tryWatching(const std::string& folder) {
  auto opened = openLongPath(AT_FDCWD, folder, O_PATH | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  auto watcher = makeWatcher();
  if (!watcher) return fail(watcher.error());
  FollowStatus status;
  status.watcher = (*watcher)->kind();
  status.limits = WatchLimits::of((*watcher)->kind());
  auto watched = (*watcher)->watch(opened->get(), 1);
  if (!watched) status.refusal = watched.error();
  return status;
}

Finding unwatched(const std::string& why, std::string remedy) {
  return {"watching", Health::limited, why + withoutWatching, std::move(remedy)};
}

std::string raise(const std::string& setting) {
  return "raise \"" + setting + "\" with sysctl";
}

std::string limitText(std::uint64_t allowed, const std::string& setting) {
  return counted(allowed, "folder", "folders") + " at most, by \"" + setting + "\"";
}

Finding watched(const std::string& how, std::optional<std::uint64_t> allowed,
                const std::string& setting) {
  const std::string limit = allowed ? "; " + limitText(*allowed, setting) : "";
  return {"watching", Health::good, how + limit, ""};
}

Finding triedFinding(const std::string& folder) {
  const auto tried = tryWatching(folder);
  if (!tried && tried.error().isPosix(EMFILE)) {
    return unwatched("there are as many watchers as are allowed",
                     "raise " + std::string(watcherSettings) + ", or end programs that watch");
  }
  if (!tried) {
    return unwatched("folders can't be watched (" + explanation(tried.error()) + ")", betterVolume);
  }
  const WatchLimits& limits = tried->limits;
  if (!tried->refusal) return watched(nameOf(*tried->watcher), limits.allowed, limits.setting);
  if (tried->refusal->isPosix(ENOSPC) && limits.allowed) {
    return unwatched(
        "no further folder can be watched; " + limitText(*limits.allowed, limits.setting),
        raise(limits.setting));
  }
  if (tried->refusal->isPosix(EACCES)) {
    return unwatched("the folder can't be watched (" + explanation(*tried->refusal) + ")",
                     "let yourself read it");
  }
  return unwatched("folders can't be watched there (" + explanation(*tried->refusal) + ")",
                   betterVolume);
}

}  // namespace

std::vector<Finding> volumeFindings(const std::string& folder) {
  const auto abilities = volumeAbilities(folder);
  if (!abilities) return {};
  return {attributesFinding(abilities->userAttributes), birthTimeFinding(abilities->hasBirthTimes),
          handleFinding(abilities->hasHandles, abilities->hasBirthTimes),
          uuidFinding(abilities->hasUUID)};
}

Finding watchingFinding(const std::string& folder, const StatusReport* status) {
  if (status != nullptr && status->watcher) {
    return watched(status->watching, status->marksAllowed, status->marksSetting);
  }
  Finding tried = triedFinding(folder);
  // One folder can be watched, and all of them can't.
  if (status == nullptr || tried.health != Health::good) return tried;
  const bool isTooMany = status->marksAllowed && status->marksNeeded > *status->marksAllowed;
  if (isTooMany) {
    return unwatched(counted(status->marksNeeded, "folder is", "folders are") + " there; " +
                         limitText(*status->marksAllowed, status->marksSetting),
                     raise(status->marksSetting));
  }
  return unwatched("folders are not watched: " + status->refusal.value_or("it was not tried"),
                   "see what \"mirabel status\" says");
}

}  // namespace mirabel
