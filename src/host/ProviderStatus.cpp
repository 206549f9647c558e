#include "host/ProviderStatus.h"

#include <algorithm>
#include <cerrno>

#include "host/ErrorText.h"
#include "host/HostedProvider.h"
#include "linux/apps/LinuxApplicationRegistry.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {
namespace {

std::string_view wordFor(WatcherKind kind) {
  switch (kind) {
    case WatcherKind::folderMarks:
      return "folderMarks";
    case WatcherKind::fileSystemMark:
      return "fileSystemMark";
    case WatcherKind::inotify:
      return "inotify";
  }
  return "";
}

std::string refusalText(const FollowStatus& following) {
  if (!following.refusal) return "it was not tried";
  if (following.refusal->isPosix(ENOSPC) && following.limits.allowed) {
    return "it needs more marks than are allowed; raise \"" + following.limits.setting +
           "\" with sysctl";
  }
  if (following.refusal->isPosix(EMFILE)) {
    return "there are as many watchers as are allowed; raise " + std::string(watcherSettings);
  }
  return explanation(*following.refusal);
}

void fillFollowing(StatusReport& report, const FollowStatus& following) {
  if (following.watcher) {
    report.watcher = wordFor(*following.watcher);
    report.watching = nameOf(*following.watcher);
  } else {
    report.refusal = refusalText(following);
    report.watching =
        "no: " + *report.refusal + ". Every question is answered by a look at all files";
  }
  report.needsMarks = following.watcher != WatcherKind::fileSystemMark;
  report.foldersWatched = following.foldersWatched;
  // Folders that came since the last look at everything have their marks too.
  report.marksNeeded = std::max(following.marksNeeded, following.foldersWatched);
  report.marksAllowed = following.limits.allowed;
  report.marksSetting = following.limits.setting;
  report.unreadableFolders = following.unreadableFolders;
}

}  // namespace

Result<StatusReport> statusOf(const HostedProvider& provider) {
  const LinuxPlatform& platform = provider.linuxPlatform();
  if (auto current = platform.index().currentEventID(); !current) return fail(current.error());
  const VolumeIndex::Status status = platform.index().status();
  StatusReport report;
  fillFollowing(report, status.following);
  report.historyUUID = platform.index().historyUUID();
  report.firstEventID = status.firstEventID;
  report.lastEventID = status.lastEventID;
  const LocalAppLibraryManager& libraries = provider.libraries().shared();
  report.appLibraries = libraries.rootURLsForAppLibraries()->size();
  report.appLibraryVersion = libraries.versionToken();
  if (const auto failure = provider.libraries().failure())
    report.appLibrariesFailure = explanation(*failure);
  for (const LeftOut& leftOut : platform.applications().leftOut())
    report.leftOut.push_back({leftOut.identifier, leftOut.reason});
  report.home = platform.home();
  report.stateFolder = platform.stateFolder();
  return report;
}

}  // namespace mirabel
