#include <algorithm>
#include <cerrno>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string_view>

#include "cli/Commands.h"
#include "cli/ErrorText.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {
namespace {

/// A word for programs.
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

/// Folders that came since the last look at everything have their marks too.
std::size_t marksNeeded(const FollowStatus& following) {
  return std::max(following.marksNeeded, following.foldersWatched);
}

std::string refusalText(const FollowStatus& following) {
  if (!following.refusal) return "it was not tried";
  if (following.refusal->isPosix(ENOSPC) && following.limits.allowed) {
    return "it needs more marks than are allowed; raise \"" + following.limits.setting +
           "\" with sysctl";
  }
  return explanation(*following.refusal);
}

std::string watchingText(const FollowStatus& following) {
  if (following.watcher) return mirabel::nameOf(*following.watcher);
  return "no: " + refusalText(following) + ". Every question is answered by a look at all files";
}

std::string marksText(const FollowStatus& following) {
  std::string text = std::to_string(marksNeeded(following)) + " needed";
  if (following.limits.allowed) {
    text += ", " + std::to_string(*following.limits.allowed) + " allowed by \"" +
            following.limits.setting + "\"";
  }
  return text;
}

/// The list of now, and the version that anchors of the root and the working set carry with it.
struct AppLibraries {
  std::size_t count;
  std::uint64_t version;
};

AppLibraries appLibrariesOf(const Session& session) {
  const LocalAppLibraryManager& libraries = session.libraries().shared();
  return {libraries.rootURLsForAppLibraries()->size(), libraries.versionToken()};
}

void printJSON(const Program& program, const Session& session, const VolumeIndex::Status& status) {
  const FollowStatus& following = status.following;
  nlohmann::json object;
  if (following.watcher) {
    object["watcher"] = wordFor(*following.watcher);
  } else {
    object["refusal"] = utf8Lossy(refusalText(following));
  }
  object["foldersWatched"] = std::to_string(following.foldersWatched);
  object["marksNeeded"] = std::to_string(marksNeeded(following));
  if (following.limits.allowed) {
    object["marksAllowed"] = std::to_string(*following.limits.allowed);
    object["marksSetting"] = following.limits.setting;
  }
  object["unreadableFolders"] = std::to_string(following.unreadableFolders);
  object["historyUUID"] = session.linuxPlatform().index().historyUUID().description();
  object["firstEventID"] = std::to_string(status.firstEventID);
  object["lastEventID"] = std::to_string(status.lastEventID);
  const AppLibraries libraries = appLibrariesOf(session);
  object["appLibraries"] = std::to_string(libraries.count);
  object["appLibraryVersion"] = std::to_string(libraries.version);
  setText(object, "stateFolder", session.linuxPlatform().stateFolder());
  program.out() << object.dump() << '\n';
}

void printRows(const Program& program, const Session& session, const VolumeIndex::Status& status) {
  const auto row = [&](std::string_view label, const std::string& value) {
    program.out() << label << std::string(20 - label.size(), ' ') << value << '\n';
  };
  const FollowStatus& following = status.following;
  row("watching", printable(watchingText(following)));
  row("folders watched", std::to_string(following.foldersWatched));
  if (following.watcher != WatcherKind::fileSystemMark) row("marks", marksText(following));
  row("unreadable folders", std::to_string(following.unreadableFolders));
  row("history", session.linuxPlatform().index().historyUUID().description());
  const bool hasEvents = status.firstEventID <= status.lastEventID;
  row("events",
      hasEvents ? std::to_string(status.firstEventID) + " to " + std::to_string(status.lastEventID)
                : "none yet");
  const AppLibraries libraries = appLibrariesOf(session);
  row("app libraries",
      std::to_string(libraries.count) + ", version " + std::to_string(libraries.version));
  row("state", printable(session.linuxPlatform().stateFolder()));
}

}  // namespace

ExitCode runStatus(Program& program) {
  const Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  VolumeIndex& index = session->linuxPlatform().index();
  if (auto current = index.currentEventID(); !current) {
    return program.report(current.error(), "can't bring the index in step with the disk");
  }
  const VolumeIndex::Status status = index.status();
  if (program.options().json) {
    printJSON(program, *session, status);
  } else {
    printRows(program, *session, status);
  }
  return ExitCode::done;
}

}  // namespace mirabel
