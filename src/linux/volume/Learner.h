#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/Newcomers.h"
#include "linux/volume/Placer.h"
#include "linux/volume/VolumeIndex.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Whether an error says that what was looked at is not there, not ours, or changed hands meanwhile
/// (ESTALE). After any other one nothing is known.
[[nodiscard]] bool isDisturbance(const Error& error);

/// Takes what was seen on disk, name by name or a folder's worth at a time, into the index, and
/// answers the identities. Used under the lock of the index, inside one of its transactions.
class Learner final : private FolderIdentities {
 public:
  using PackageNames = std::function<bool(std::string_view)>;

  /// References outlive it. `device` is the number of the volume's own file system.
  Learner(IdentityStore& store, IdentifierAllocator& allocator, ChangeRecorder& recorder,
          const MonitoredRoots& roots, std::uint64_t device, PackageNames isPackageName);

  /// File ID of the folder at `path`, which is open as `folder`; learns it and the folders above
  /// where they are not known to lie there.
  [[nodiscard]] Result<std::uint64_t> folderID(const std::string& path, int folder) override;
  /// The same where it was looked at already.
  [[nodiscard]] Result<std::uint64_t> folderID(const std::string& path, int folder,
                                               const ObjectStatus& status);

  /// File ID of the root at `path`; takes in what has become of its own dates and count. For
  /// `isReported` here and below see `Sighting`.
  [[nodiscard]] Result<std::uint64_t> rootID(const std::string& path, bool isReported = false);

  /// Fills in the identities of names seen in that folder. A name that went away meanwhile is
  /// left with the file ID 0; of one that another object has taken, status and kind are renewed.
  /// Answers the file ID of the folder.
  [[nodiscard]] Result<std::uint64_t> learn(const std::string& folderPath, int folder,
                                            std::span<Sighting> sightings);
  /// The same for a folder that was seen, since the lock was taken, to be the object of that file
  /// ID and to lie where the index has it.
  [[nodiscard]] Result<std::uint64_t> learn(const std::string& folderPath, int folder,
                                            std::uint64_t knownID, std::span<Sighting> sightings);
  [[nodiscard]] Result<Sighting> learnPath(const std::string& path, const ObjectStatus& status,
                                           bool isPackage, bool isReported = false);

  /// See `Placer`.
  [[nodiscard]] std::set<std::uint64_t> takeArrivedFolders() {
    return placer_.takeArrivedFolders();
  }
  /// Tells where names have changed of late; null, which it is at first: nobody does.
  void setRecentPlaces(RecentPlaces* places) { finder_.setRecentPlaces(places); }
  /// Where the index has the object, if it stands there; nothing is searched for.
  [[nodiscard]] Result<std::optional<std::string>> standingPath(std::uint64_t fileID);

  /// Where the object lies now, the disk being right; nothing when it is not to be found. What
  /// was found out is in the index then, a save of the document by another object included.
  [[nodiscard]] Result<std::optional<std::string>> find(std::uint64_t fileID);
  /// Takes in that the object is not at its place, nor anywhere that was looked at: it goes on
  /// under another of its names, or is detached.
  [[nodiscard]] Result<void> leave(ObjectRow row);
  /// The folder at `path`, which becomes a root, with all below it, is nowhere as yet: what was
  /// learned of it before, by its whole path, was of no concern to those who are told of it now.
  [[nodiscard]] Result<void> leaveOutside(const std::string& path);
  /// File ID of the object that holds the document now.
  [[nodiscard]] Result<std::optional<std::uint64_t>> holderOf(std::uint32_t documentID);

 private:
  /// An entry of a batch that is not just as the index has it.
  struct Unsettled {
    std::size_t index;
    bool isNew;  ///< the index had nothing under its inode number
    std::string handle;
  };
  struct Folder {
    const std::string& path;
    int descriptor;
    std::uint64_t id;
  };
  [[nodiscard]] Result<void> learnIn(const Folder& folder, std::span<Sighting> sightings);
  [[nodiscard]] bool isOnVolume(const Sighting& sighting) const;
  /// Answers the identity where nothing has happened to the entry.
  [[nodiscard]] Result<Knowledge> recognise(std::uint64_t folder, Sighting& sighting);
  /// Reads the handles of new entries, on two threads.
  static void readHandles(int folder, std::span<const Sighting> sightings,
                          std::vector<Unsettled>& entries);
  [[nodiscard]] Result<void> placeEntry(const Folder& folder, Sighting& sighting, Unsettled entry,
                                        Newcomers& newcomers);
  [[nodiscard]] Result<bool> isNewcomer(const Folder& folder, const Sighting& sighting,
                                        const Newcomers& newcomers);

  [[nodiscard]] Result<void> correctDocuments(std::span<Sighting> sightings);

  /// Whether the object is at the path that the index gives; the path if so.
  [[nodiscard]] Result<std::optional<std::string>> verify(const ObjectRow& row);
  /// Finds the folders above again that have moved.
  [[nodiscard]] Result<void> settleFoldersAbove(const Location& location);
  [[nodiscard]] Result<void> settleRoot(const std::vector<std::uint64_t>& foldersAbove);
  /// Learns what is at that place now.
  [[nodiscard]] Result<void> learnAt(const Location& location);
  /// Learns a root, or something outside of all: known by its whole path, unless that is another
  /// way to something which lies below a root.
  [[nodiscard]] Result<Sighting> learnWhole(const std::string& path, bool isPackage);
  /// The row of what is seen, if that stands where the index has it.
  [[nodiscard]] Result<std::optional<ObjectRow>> objectInPlace(const SeenObject& seen);
  [[nodiscard]] Result<std::optional<std::string>> search(ObjectRow row);
  [[nodiscard]] Result<std::vector<ObjectRow>> occupants(std::uint64_t folder,
                                                         std::span<const Sighting> sightings);

  IdentityStore& store_;
  ChangeRecorder& recorder_;
  const MonitoredRoots& roots_;
  std::uint64_t device_;
  PackageNames isPackageName_;
  IndexedPaths paths_;
  ObjectFinder finder_;
  Placer placer_;
};

}  // namespace mirabel
