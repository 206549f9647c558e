#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <map>
#include <nlohmann/json.hpp>
#include <ostream>
#include <system_error>
#include <vector>

#include "cli/Commands.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "host/ErrorText.h"
#include "host/bus/RemoteDocuments.h"
#include "linux/files/HomeLayout.h"
#include "linux/kernel/LongPath.h"
#include "linux/volume/FollowStatus.h"
#include "linux/volume/VolumeAbilities.h"

namespace mirabel {
namespace {

enum class Health { good, limited, bad };

/// One line: what was looked at, how it is, and how to mend it where it can be mended.
struct Finding {
  std::string subject;
  Health health;
  std::string text;
  std::string remedy;
};

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
  return {subject, Health::limited, "could not be tried: " + explanation(error),
          "make the document storage writable"};
}

Finding birthTimeFinding(bool has) {
  const std::string subject = "birth times";
  if (has) return {subject, Health::good, "the volume tells when a file was made", ""};
  return {subject, Health::limited, "the volume does not tell when a file was made",
          "creation dates are absent, and every question about an item takes a look at the disk"};
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
          "keep documents on ext4, xfs, btrfs or tmpfs"};
}

Finding uuidFinding(bool has) {
  const std::string subject = "volume UUID";
  if (has) return {subject, Health::good, "the volume has one of its own", ""};
  return {subject, Health::limited,
          "the volume has none, or the kernel does not tell it (6.9 and later do); one is made "
          "from the file system's ID",
          ""};
}

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

// The kernel has limits of its own for whoever watches.
std::string remedyForWatching(const Error& error) {
  if (!error.isPosix(EMFILE)) return "";
  return "raise \"fs.fanotify.max_user_groups\" and \"fs.inotify.max_user_instances\" with sysctl, "
         "those of \"user.\" where that is a container's, or end other programs that watch";
}

// One folder is tried. How many there are is not counted for this: "mirabel status" knows.
Finding watchingFinding(const std::string& folder) {
  const std::string subject = "watching";
  const std::string without = ": every question about changes is answered by a look at all files";
  const auto tried = tryWatching(folder);
  if (!tried) {
    return {subject, Health::limited,
            "folders can't be watched (" + explanation(tried.error()) + ")" + without,
            remedyForWatching(tried.error())};
  }
  std::string limit;
  if (tried->limits.allowed) {
    limit = std::to_string(*tried->limits.allowed) + " folders at most, by \"" +
            tried->limits.setting + "\"";
  }
  if (!tried->refusal) {
    return {subject, Health::good,
            std::string(nameOf(*tried->watcher)) + (limit.empty() ? "" : "; ") + limit, ""};
  }
  if (tried->refusal->isPosix(ENOSPC) && !limit.empty()) {
    return {subject, Health::limited, "no further folder can be watched; " + limit + without,
            "raise \"" + tried->limits.setting + "\" with sysctl"};
  }
  return {subject, Health::limited,
          "folders can't be watched there (" + explanation(*tried->refusal) + ")" + without, ""};
}

Finding stateFinding(const Result<void>& opened, const HomeLayout& layout) {
  const std::string subject = "state";
  if (opened) return {subject, Health::good, layout.stateFolder, ""};
  const std::string text = explanation(opened.error());
  if (opened.error().isPosix(EBUSY)) return {subject, Health::limited, text, ""};
  if (opened.error().isPosix(EROFS)) {
    return {subject, Health::bad, text,
            "nothing can be presented until the home can be written to, or XDG_STATE_HOME names a "
            "folder that can"};
  }
  return {subject, Health::bad, layout.stateFolder + ": " + text,
          "identities can't be kept until this is mended"};
}

Finding changesFinding(const Error& error, const HomeLayout& layout) {
  return {"changes", Health::bad, layout.documents + ": " + explanation(error),
          "what has changed can't be told until this is mended"};
}

// The log of the volume's database may grow to 16 MiB before it is moved into it.
Finding roomFinding(const HomeLayout& layout) {
  constexpr std::uintmax_t enough = 64 << 20;
  constexpr std::uintmax_t least = 1 << 20;
  const std::string subject = "room";
  std::error_code failure;
  const auto space = std::filesystem::space(layout.stateFolder, failure);
  if (failure) return {subject, Health::limited, "can't be told: " + failure.message(), ""};
  const std::string text = humanSize(space.available) + " where the state is kept";
  if (space.available >= enough) return {subject, Health::good, text, ""};
  return {
      subject, space.available < least ? Health::bad : Health::limited,
      text + ": what is known is answered; what is new may not be remembered, and then is refused",
      "make room there"};
}

std::string plural(std::size_t count, const std::string& one, const std::string& several) {
  return std::to_string(count) + " " + (count == 1 ? one : several);
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

void addApplicationFindings(const StatusReport& status, std::vector<Finding>& findings) {
  findings.push_back({"app libraries", Health::good,
                      plural(status.appLibraries, "application shows its documents",
                             "applications show their documents"),
                      ""});
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

void addStateFindings(const Program& program, const HomeLayout& layout,
                      std::vector<Finding>& findings) {
  const auto documents = openedBy(program);
  findings.push_back(stateFinding(documents ? Result<void>() : fail(documents.error()), layout));
  if (!documents) return;
  findings.push_back(roomFinding(layout));
  const auto status = (*documents)->status();
  if (!status) return findings.push_back(changesFinding(status.error(), layout));
  addApplicationFindings(*status, findings);
}

std::vector<Finding> examine(Program& program, const HomeLayout& layout) {
  std::vector<Finding> findings;
  findings.push_back({"home", Health::good, layout.home, ""});
  auto abilities = volumeAbilities(layout.documents);
  const std::string* volume = &layout.documents;
  if (!abilities) {
    findings.push_back({"documents", Health::bad,
                        layout.documents + ": " + explanation(abilities.error()),
                        "make the folder; until then there is nothing to present"});
    volume = &layout.home;
    abilities = volumeAbilities(*volume);
  } else {
    findings.push_back({"documents", Health::good, layout.documents, ""});
  }
  if (abilities) {
    findings.push_back(attributesFinding(abilities->userAttributes));
    findings.push_back(birthTimeFinding(abilities->hasBirthTimes));
    findings.push_back(handleFinding(abilities->hasHandles, abilities->hasBirthTimes));
    findings.push_back(uuidFinding(abilities->hasUUID));
    findings.push_back(watchingFinding(*volume));
  }
  findings.push_back(serviceFinding(layout));
  addStateFindings(program, layout, findings);
  return findings;
}

void print(Program& program, const Finding& finding) {
  if (program.options().json) {
    nlohmann::json line = {{"subject", finding.subject}, {"health", nameOf(finding.health)}};
    setText(line, "text", finding.text);
    if (!finding.remedy.empty()) line["remedy"] = finding.remedy;
    program.out() << line.dump() << '\n';
    return;
  }
  std::string label(nameOf(finding.health));
  label.resize(9, ' ');
  program.out() << label << finding.subject << ": " << printable(finding.text);
  if (!finding.remedy.empty()) program.out() << " (" << finding.remedy << ")";
  program.out() << '\n';
}

}  // namespace

ExitCode runDoctor(Program& program) {
  HomeLayout::Choices choices;
  choices.home = program.options().home;
  auto layout = HomeLayout::resolve(choices);
  if (!layout) {
    static_cast<void>(program.report(layout.error(), "can't examine the home"));
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
