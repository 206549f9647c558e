#include <nlohmann/json.hpp>
#include <ostream>
#include <string_view>

#include "cli/Commands.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

std::string marksText(const StatusReport& status) {
  std::string text = std::to_string(status.marksNeeded) + " needed";
  if (status.marksAllowed) {
    text +=
        ", " + std::to_string(*status.marksAllowed) + " allowed by \"" + status.marksSetting + "\"";
  }
  return text;
}

void printJSON(const Program& program, const StatusReport& status) {
  nlohmann::json object;
  if (status.watcher) object["watcher"] = *status.watcher;
  if (status.refusal) object["refusal"] = utf8Lossy(*status.refusal);
  object["foldersWatched"] = std::to_string(status.foldersWatched);
  object["marksNeeded"] = std::to_string(status.marksNeeded);
  if (status.marksAllowed) {
    object["marksAllowed"] = std::to_string(*status.marksAllowed);
    object["marksSetting"] = status.marksSetting;
  }
  object["unreadableFolders"] = std::to_string(status.unreadableFolders);
  object["historyUUID"] = status.historyUUID.description();
  object["firstEventID"] = std::to_string(status.firstEventID);
  object["lastEventID"] = std::to_string(status.lastEventID);
  object["appLibraries"] = std::to_string(status.appLibraries);
  object["appLibraryVersion"] = std::to_string(status.appLibraryVersion);
  if (status.appLibrariesFailure) {
    object["appLibrariesFailure"] = utf8Lossy(*status.appLibrariesFailure);
  }
  setText(object, "stateFolder", status.stateFolder);
  program.out() << object.dump() << '\n';
}

void printRows(const Program& program, const StatusReport& status) {
  const auto row = [&](std::string_view label, const std::string& value) {
    program.out() << label << std::string(20 - label.size(), ' ') << value << '\n';
  };
  row("watching", printable(status.watching));
  row("folders watched", std::to_string(status.foldersWatched));
  if (status.needsMarks) row("marks", marksText(status));
  row("unreadable folders", std::to_string(status.unreadableFolders));
  row("history", status.historyUUID.description());
  const bool hasEvents = status.firstEventID <= status.lastEventID;
  row("events",
      hasEvents ? std::to_string(status.firstEventID) + " to " + std::to_string(status.lastEventID)
                : "none yet");
  row("app libraries", std::to_string(status.appLibraries) + ", version " +
                           std::to_string(status.appLibraryVersion));
  if (status.appLibrariesFailure) {
    row("", "not up to date: " + printable(*status.appLibrariesFailure));
  }
  row("state", printable(status.stateFolder));
}

}  // namespace

ExitCode runStatus(Program& program) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto status = documents->status();
  if (!status) {
    return program.report(status.error(), "can't bring the index in step with the disk");
  }
  if (program.options().json) {
    printJSON(program, *status);
  } else {
    printRows(program, *status);
  }
  return ExitCode::done;
}

}  // namespace mirabel
