#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "mirabel/Values.h"

namespace mirabel {

/// How changes are followed, and what the history holds.
struct StatusReport {
  std::optional<std::string> watcher;  ///< for programs: "folderMarks" or "inotify"; absent: none
  std::string watching;                ///< the same for people, or why nothing is watched
  std::optional<std::string> refusal;  ///< why nothing is watched
  bool needsMarks = true;              ///< one for each folder
  std::uint64_t foldersWatched = 0;
  std::uint64_t marksNeeded = 0;
  std::optional<std::uint64_t> marksAllowed;
  std::string marksSetting;             ///< what allows them: the name of a setting of sysctl
  std::uint64_t unreadableFolders = 0;  ///< what lies in them is not seen
  UUID historyUUID;
  std::uint64_t firstEventID = 0;  ///< of those that are kept; none are when it is behind the last
  std::uint64_t lastEventID = 0;
  std::uint64_t appLibraries = 0;
  std::uint64_t appLibraryVersion = 0;  ///< of the list of them; grows with each change of it
  std::optional<std::string> appLibrariesFailure;  ///< why the list may not be that of now
  /// Applications whose documents are not shown for a reason that a person should know.
  struct LeftOutApplication {
    std::string identifier;  ///< empty: stands for all that there is no room to name
    std::string reason;
  };
  std::vector<LeftOutApplication> leftOut;
  std::string home;
  std::string stateFolder;
};

}  // namespace mirabel
