#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <sys/statvfs.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "cli/Commands.h"
#include "cli/Finding.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "cli/VolumeFindings.h"
#include "host/ErrorText.h"
#include "host/bus/RemoteDocuments.h"
#include "linux/apps/ApplicationDirectories.h"
#include "linux/files/HomeLayout.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

std::string_view nameOf(Health health) {
  switch (health) {
    case Health::good:
      return "ok";
    case Health::limited:
      return "limited";
    case Health::bad:
      return "missing";
  }
  return "";
}

bool isForbidden(const Error& error) {
  return error.isPosix(EACCES) || error.isPosix(EPERM);
}

bool isFull(const Error& error) {
  return error.isPosix(ENOSPC) || error.isPosix(EDQUOT);
}

/// Of a home that can't be made out.
std::string remedyForLayout(const Error& error) {
  if (isForbidden(error)) return "run it as the user whose home that is, or have it opened to you";
  if (error.isPosix(EINVAL)) return "have the documents lie in another home";
  return "put a folder there, or name another home with --home";
}

Result<void> tryReading(const std::string& folder) {
  auto opened = openLongPath(AT_FDCWD, folder, O_RDONLY | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  RawDirectory entries(std::move(*opened));
  if (auto entry = entries.next(); !entry) return fail(entry.error());
  // What can be listed but not entered is no use either.
  if (auto entered = statusAt(entries.descriptor(), "."); !entered) return fail(entered.error());
  return {};
}

Finding documentsFinding(const HomeLayout& layout) {
  const std::string subject = "documents";
  const auto readable = tryReading(layout.documents);
  if (readable) return {subject, Health::good, layout.documents, ""};
  const Error& error = readable.error();
  std::string remedy = "mount it, or mend the disk that it lies on";
  if (error.isPosix(ENOENT)) remedy = "make the folder";
  if (isForbidden(error)) remedy = "let yourself read and enter it, as with chmod u+rwx";
  return {subject, Health::bad,
          layout.documents + ": " + explanation(error) + "; there is nothing to present", remedy};
}

/// What the file system of the state has left.
struct Room {
  bool isTold = false;
  bool hasFiles = true;  ///< whether another file can be made
  std::uint64_t bytes = 0;
};

Result<Room> roomFor(std::string path) {
  struct statvfs found {};
  // Where the folder is still to be made, what it is made in has the room.
  while (::statvfs(path.c_str(), &found) != 0) {
    if (errno != ENOENT || path == "/") return fail(Error::posix(errno));
    path = std::filesystem::path(path).parent_path();
  }
  return Room{found.f_blocks > 0, found.f_files == 0 || found.f_favail > 0,
              std::uint64_t{found.f_bavail} * found.f_frsize};
}

// The log of the volume's database may grow to 16 MiB before it is moved into it.
Finding roomFinding(const Result<Room>& room) {
  constexpr std::uint64_t enough = 64 << 20;
  constexpr std::uint64_t least = 1 << 20;
  const std::string subject = "room";
  const std::string where = " where the state is kept";
  const std::string without =
      ": what is known is answered; what is new may not be remembered, and then is refused";
  if (!room) {
    return {subject, Health::limited, "can't be told: " + explanation(room.error()),
            "let yourself reach the folder of the state"};
  }
  if (!room->hasFiles) {
    return {subject, Health::bad, "no further file can be made" + where + without,
            "delete files there, small ones too: it is their number that is used up"};
  }
  if (!room->isTold) return {subject, Health::good, "the file system does not tell" + where, ""};
  const std::string text = humanSize(room->bytes) + where;
  if (room->bytes >= enough) return {subject, Health::good, text, ""};
  return {subject, room->bytes < least ? Health::bad : Health::limited, text + without,
          "make room there"};
}

/// For the folder that the error names.
std::string remedyForState(const Error& error) {
  if (error.isPosix(EACCES)) {
    return "let yourself write there, or have XDG_STATE_HOME name a folder where you may";
  }
  if (error.isPosix(EROFS)) {
    return "mount it for writing, or have XDG_STATE_HOME name a folder that can be written to";
  }
  if (isFull(error)) return "see \"room\"";
  if (isForbidden(error)) return "have a folder of your own in its place";
  if (error.domain == ErrorDomain::store) {
    return "move the folder of the state away; identities then begin anew";
  }
  return "mend the disk, or have XDG_STATE_HOME name a folder elsewhere";
}

/// The path, and why, which mostly names a path itself.
std::string withPath(const std::string& path, const Error& error) {
  const std::string text = explanation(error);
  return text.find('/') == std::string::npos ? path + ": " + text : text;
}

Finding stateFinding(const Error& error, const HomeLayout& layout, bool hasFiles) {
  const std::string subject = "state";
  if (error.isPosix(EBUSY)) {
    return {subject, Health::limited,
            layout.stateFolder +
                ": another process is using it, so that what it holds was not "
                "examined; other commands wait too",
            "try again when that is done, or wait longer with --timeout SECONDS"};
  }
  const std::string text = isFull(error) && !hasFiles
                               ? layout.stateFolder + ": no further file can be made"
                               : withPath(layout.stateFolder, error);
  return {subject, Health::bad, text + "; identities can't be kept, and nothing can be presented",
          remedyForState(error)};
}

Finding changesFinding(const Error& error, const HomeLayout& layout) {
  std::string remedy = "try again; else mend the disk";
  if (isForbidden(error)) remedy = "let yourself read what it names";
  if (isFull(error)) remedy = "see \"room\"";
  return {"changes", Health::bad,
          withPath(layout.documents, error) + "; what has changed can't be told", remedy};
}

/// What was left out for the same reason, in one line.
struct LeftOutKind {
  std::string names;
  std::size_t count = 0;

  void add(const std::string& name) {
    constexpr std::size_t mostNamed = 3;
    if (count < mostNamed) names += (count == 0 ? "" : ", ") + name;
    if (count == mostNamed) names += ", ...";
    ++count;
  }
};

Finding appLibrariesFinding(const StatusReport& status, const HomeLayout& layout) {
  const std::string subject = "app libraries";
  const std::string shown = counted(status.appLibraries, "application shows its documents",
                                    "applications show their documents");
  if (!status.appLibrariesFailure) return {subject, Health::good, shown, ""};
  return {subject, Health::bad,
          "the list of them can't be brought up to date (" + *status.appLibrariesFailure +
              "), and is that of before: " + shown,
          "let yourself write to " + layout.applicationSupport +
              "/Mirabel, where it is kept, and make room there"};
}

// A directory of entries that is closed to the user counts as empty.
void addClosedDirectories(const HomeLayout& layout, ApplicationDirectories::Reach reach,
                          std::vector<Finding>& findings) {
  const auto directories = ApplicationDirectories::of(layout.home, reach);
  std::vector<std::string> all = directories.user;
  all.insert(all.end(), directories.system.begin(), directories.system.end());
  all.push_back(layout.home + "/.var/app");
  for (const std::string& directory : all) {
    const bool isClosed =
        ::faccessat(AT_FDCWD, directory.c_str(), R_OK | X_OK, AT_EACCESS) != 0 && errno == EACCES;
    if (!isClosed) continue;
    findings.push_back({"applications", Health::limited,
                        directory + ": permission denied; what it would tell is left out",
                        "let yourself read and enter it"});
  }
}

void addUnreadableFolders(const StatusReport& status, const HomeLayout& layout,
                          std::vector<Finding>& findings) {
  if (status.unreadableFolders == 0) return;
  findings.push_back({"folders", Health::limited,
                      counted(status.unreadableFolders, "folder", "folders") +
                          " can't be read: what lies in there is not shown",
                      "find " + layout.documents +
                          " -type d ! -readable -prune -print names those "
                          "of the documents"});
}

void addApplicationFindings(const StatusReport& status, const HomeLayout& layout,
                            std::vector<Finding>& findings) {
  findings.push_back(appLibrariesFinding(status, layout));
  std::map<std::string, LeftOutKind> kinds;
  for (const auto& leftOut : status.leftOut)
    kinds[leftOut.reason].add(leftOut.identifier);
  for (const auto& [reason, kind] : kinds) {
    // What has no name stands for all that there is no room to name.
    const std::string text =
        kind.names.empty() ? "left out: " + reason : "left out (" + reason + "): " + kind.names;
    findings.push_back({"applications", Health::limited, text, ""});
  }
}

Finding serviceFinding(const HomeLayout& layout) {
  const std::string subject = "service";
  if (bus::RemoteDocuments::connect({layout.home, layout.stateFolder})) {
    return {subject, Health::good, "it runs for this home, and commands go through it", ""};
  }
  if (bus::RemoteDocuments::hasBus()) {
    return {subject, Health::good,
            "it does not run for this home; commands do without, other programs can't",
            "\"systemctl --user enable --now mirabel\" starts it"};
  }
  return {subject, Health::limited,
          "there is no session bus: other programs can't reach the documents; commands do without",
          "log in to a session that has one"};
}

Result<std::unique_ptr<Documents>> openedBy(const Program& program) {
  const GlobalOptions& options = program.options();
  return openDocuments({options.home, options.timeout, options.embedded,
                        [&](std::string_view text) { program.note(text); }});
}

/// What is told by whoever has the state.
void addStateFindings(const Result<std::unique_ptr<Documents>>& documents,
                      const Result<StatusReport>& status, const HomeLayout& layout,
                      std::vector<Finding>& findings) {
  const auto room = roomFor(layout.stateFolder);
  if (documents) {
    findings.push_back({"state", Health::good, layout.stateFolder, ""});
  } else {
    findings.push_back(stateFinding(documents.error(), layout, !room || room->hasFiles));
  }
  findings.push_back(roomFinding(room));
  if (!documents) return;
  if (!status) return findings.push_back(changesFinding(status.error(), layout));
  addUnreadableFolders(*status, layout, findings);
  addApplicationFindings(*status, layout, findings);
}

std::vector<Finding> examine(Program& program, const HomeLayout& layout) {
  std::vector<Finding> findings;
  findings.push_back({"home", Health::good, layout.home, ""});
  findings.push_back(documentsFinding(layout));
  const bool isThere = ::access(layout.documents.c_str(), F_OK) == 0;
  const std::string& volume = isThere ? layout.documents : layout.home;
  for (Finding& finding : volumeFindings(volume))
    findings.push_back(std::move(finding));
  const auto documents = openedBy(program);
  const auto status =
      documents ? (*documents)->status() : Result<StatusReport>(fail(documents.error()));
  findings.push_back(watchingFinding(volume, status ? &*status : nullptr));
  findings.push_back(serviceFinding(layout));
  addStateFindings(documents, status, layout, findings);
  const bool isGiven = program.options().home.has_value();
  addClosedDirectories(layout,
                       isGiven ? ApplicationDirectories::Reach::homeAlone
                               : ApplicationDirectories::Reach::wholeMachine,
                       findings);
  return findings;
}

void print(Program& program, const Finding& finding) {
  if (program.options().json) {
    nlohmann::json line = {{"subject", finding.subject}, {"health", nameOf(finding.health)}};
    setText(line, "text", finding.text);
    if (!finding.remedy.empty()) setText(line, "remedy", finding.remedy);
    program.out() << line.dump() << '\n';
    return;
  }
  std::string label(nameOf(finding.health));
  label.resize(9, ' ');
  program.out() << label << finding.subject << ": " << printable(finding.text);
  if (!finding.remedy.empty()) program.out() << " (" << printable(finding.remedy) << ")";
  program.out() << '\n';
}

}  // namespace

ExitCode runDoctor(Program& program) {
  HomeLayout::Choices choices;
  choices.home = program.options().home;
  auto layout = HomeLayout::resolve(choices);
  if (!layout) {
    const Error& error = layout.error();
    print(program, {"home", Health::bad, explanation(error), remedyForLayout(error)});
    return ExitCode::failed;
  }
  ExitCode result = ExitCode::done;
  for (const Finding& finding : examine(program, *layout)) {
    print(program, finding);
    if (finding.health == Health::bad) result = ExitCode::failed;
  }
  return result;
}

}  // namespace mirabel
