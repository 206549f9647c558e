#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/EventJournal.h"
#include "linux/volume/FollowStatus.h"
#include "linux/volume/FollowedFolders.h"
#include "linux/volume/JournalBell.h"
#include "linux/volume/KeptAttributes.h"
#include "linux/volume/StateFolder.h"
#include "linux/watch/FolderWatcher.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// A name seen in a folder, and the identity that the index gives to what it names.
struct Sighting {
  std::string name;
  ObjectStatus status;
  bool isPackage = false;
  std::uint64_t fileID = 0;      ///< answered
  std::uint32_t documentID = 0;  ///< answered; 0 for what is no document
  /// A record says that it was written to, or its attributes were: true also where times are too
  /// coarse to show it.
  bool isReported = false;
};

/// The lasting identities of one volume: which object has which file ID, which document has which
/// document ID, and where they were last seen. Kept in the database "volume.db" of the volume's
/// state folder; one process owns it at a time. Thread-safe. Whatever an operation has answered
/// is on disk.
class VolumeIndex {
 public:
  struct Options {
    /// The state folder of the program; the volume's own folder is made below it.
    std::string stateFolder;
    /// A folder that exists, on the volume of the roots.
    std::string volumePath;
    /// Whether a folder of that name is a package; asked for names met while searching.
    std::function<bool(std::string_view name)> isPackageName;
    /// How long to wait for another process that owns the volume.
    std::chrono::milliseconds timeout{30'000};
    /// Hears of changes once the history has begun; nothing: every question about the history is
    /// answered by a look at all files.
    std::function<Result<std::unique_ptr<FolderWatcher>>()> makeWatcher;
    /// Whether a thread takes in changes as they come; else only who asks brings the index in step.
    bool followsInBackground = true;
    /// Told once when it has to wait, and when a damaged database was set aside.
    std::function<void(std::string_view)> notice;
    /// Told once, and why, when the index has become unusable until it is opened anew: see
    /// `VolumeState`, or the document storage is on another volume now, and nothing of this state
    /// is true of that. Not to call the index from.
    std::function<void(std::string_view why)> broken;
  };

  /// Opens or makes the index of the volume that holds `volumePath`. Errors: POSIX EBUSY when
  /// another process owned it to the end of the timeout; EPERM for a state folder that is a
  /// symbolic link or belongs to somebody else; EINVAL for one below a root; EMEDIUMTYPE where the
  /// first root is on another volume, as with whatever is asked after it has come to be; other
  /// POSIX errors; `ErrorDomain::store`.
  [[nodiscard]] static Result<std::unique_ptr<VolumeIndex>> open(MonitoredRoots& roots,
                                                                 Options options);
  virtual ~VolumeIndex() = default;

  /// Gives identities to names seen in the folder that is open as `folder` (O_PATH will do) and
  /// lies at `folderPath`. What it had not seen it learns; document IDs are allocated at once.
  /// Answers the folder's own file ID.
  [[nodiscard]] virtual Result<std::uint64_t> learn(const std::string& folderPath, int folder,
                                                    std::span<Sighting> sightings) = 0;
  /// The same for one object by path: a root, something below one, or outside them all.
  [[nodiscard]] virtual Result<Sighting> learnPath(const std::string& path,
                                                   const ObjectStatus& status, bool isPackage) = 0;

  /// Several of these in one transaction; what is not there, or not ours, is left out. POSIX
  /// errors; `ErrorDomain::store`.
  [[nodiscard]] virtual Result<void> learnPaths(std::span<const std::string> paths) = 0;

  /// Checked against the disk; looks further when the object is not where it was. ENOENT when there
  /// is none; after another error nothing is known, as with all of these.
  [[nodiscard]] virtual Result<std::string> pathOfFileID(std::uint64_t fileID) = 0;
  /// Every name of the object that the index has and the disk agrees to; where there is none it
  /// looks further, for one. Empty when that finds nothing.
  [[nodiscard]] virtual Result<std::vector<std::string>> pathsOfFileID(std::uint64_t fileID) = 0;
  /// ENOENT when no object holds the document.
  [[nodiscard]] virtual Result<std::uint64_t> fileIDOfDocument(std::uint32_t documentID) = 0;

  /// Brings the index in step with everything below the roots, by a look at every entry. What
  /// differs becomes events.
  [[nodiscard]] virtual Result<void> reconcile() = 0;
  /// Brings the index in step, and answers the ID of the last event: whatever a finished system
  /// call changed has an ID at or below it. The first call begins the history; from then on changes
  /// are heard of.
  [[nodiscard]] virtual Result<std::uint64_t> currentEventID() = 0;
  /// At most `limit` events after `since`, oldest first. Error: POSIX ESTALE when some of them are
  /// no longer kept, or `since` was never given out.
  [[nodiscard]] virtual Result<std::vector<JournalRecord>> events(std::uint64_t since,
                                                                  std::size_t limit) = 0;

  /// Makes these the roots beside the first, as they belong to that version of their list (0: to
  /// none). What lies in one that comes is told as it is found, what lay in one that goes as gone,
  /// and the folder itself where its label is another one. They are remembered: the next process
  /// begins with them.
  [[nodiscard]] virtual Result<void> follow(const std::vector<FollowedFolder>& folders,
                                            std::uint64_t version) = 0;
  /// See `FollowedFolders`.
  [[nodiscard]] virtual std::uint64_t lastEventUnder(std::uint64_t version) = 0;

  /// Tells whoever is added that there are further events.
  [[nodiscard]] virtual JournalBell& bell() = 0;
  struct Status {
    FollowStatus following;
    /// Events kept: IDs from `firstEventID` to `lastEventID`; both 0 before the history begins.
    std::uint64_t firstEventID = 0;
    std::uint64_t lastEventID = 0;
    bool isUsable = true;  ///< see `Options::broken`
  };
  [[nodiscard]] virtual Status status() = 0;

  /// How often something was written to it. Waits for nobody.
  [[nodiscard]] virtual std::uint64_t commits() const = 0;
  /// Gives back what it keeps in memory to answer sooner, and has the allocator give back what the
  /// whole process has freed.
  virtual void releaseMemory() = 0;

  /// What is remembered of objects by file ID.
  [[nodiscard]] virtual KeptAttributes& keptAttributes() = 0;

  [[nodiscard]] virtual UUID historyUUID() const = 0;
  /// Where the state of the volume is kept, for as long as the index is open.
  [[nodiscard]] virtual const StateFolder& stateFolder() const = 0;
  /// The volume's number as the system sees it; never 0.
  [[nodiscard]] virtual std::uint32_t device() const = 0;
};

}  // namespace mirabel
