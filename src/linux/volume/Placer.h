#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "linux/volume/ChangeRecorder.h"
#include "linux/volume/IdentifierAllocator.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/IndexedPaths.h"
#include "linux/volume/ObjectFinder.h"
#include "linux/volume/ObjectMatcher.h"
#include "mirabel/Error.h"

namespace mirabel {

/// An entry on its way into the index.
struct Arrival {
  SeenObject seen;
  std::string folderPath;
  Location location;
  ObjectKind kind = ObjectKind::other;
  bool isOccupied = true;  ///< false: the index surely has nothing under that name
  /// Set when the index surely has nothing under the inode number: the handle of what is seen,
  /// empty where the file system has none.
  std::optional<std::string> newHandle = std::nullopt;
  bool isReported = false;  ///< see `Sighting`
};

/// The row that the index has for an inode number, which may be another generation's.
struct Slot {
  std::uint64_t fileSystem = 0;  ///< 0: the volume itself
  std::optional<ObjectRow> row;
};

/// Gives the file ID of a folder, learning it where need be.
class FolderIdentities {
 public:
  virtual ~FolderIdentities() = default;
  [[nodiscard]] virtual Result<std::uint64_t> folderID(const std::string& path, int folder) = 0;
};

/// Brings one row of the index in step with an entry seen on disk. What happened between two
/// looks is told apart here:
///
/// - a known object under another name was renamed or moved, or has a further link;
/// - another object under a known document's name is a save of that document, and takes its
///   document ID over, when the former object is gone or was renamed to a backup of itself in the
///   same folder; when it is found elsewhere it was moved, and keeps its document;
/// - another generation of an inode number is a new object with a file ID of its own.
///
/// Used under the lock of the index, inside one of its transactions.
class Placer {
 public:
  /// References outlive it. `device` is the number of the volume's own file system.
  Placer(IdentityStore& store, IdentifierAllocator& allocator, ChangeRecorder& recorder,
         ObjectFinder& finder, const MonitoredRoots& roots, const IndexedPaths& paths,
         FolderIdentities& folders, std::uint64_t device,
         std::function<bool(std::string_view)> isPackageName);

  /// The row as it is afterwards. POSIX error ESTALE when the entry went away meanwhile.
  [[nodiscard]] Result<ObjectRow> place(Arrival arrival);

  [[nodiscard]] Result<Slot> slotOf(const SeenObject& seen);

  /// Asked for before the whole tree is looked through, so that one search serves a batch.
  void setOthers(ObjectFinder::Others others) { others_ = std::move(others); }

  /// Documents that were taken from the objects which had them, since the last call.
  [[nodiscard]] std::set<std::uint32_t> takenDocuments() {
    return std::exchange(takenDocuments_, {});
  }

  /// File IDs of folders that are new, or came back from nowhere, since the last call: of what lies
  /// in them nothing is known.
  [[nodiscard]] std::set<std::uint64_t> takeArrivedFolders() {
    return std::exchange(arrivedFolders_, {});
  }

  /// Puts an object that is not at its place where the finder has found it.
  [[nodiscard]] Result<ObjectRow> placeFound(ObjectRow row, const ObjectFinder::Found& found);
  /// Moves the row to one of the object's other names that still stands, and tells of that and of
  /// those that do not; false when none does.
  [[nodiscard]] Result<bool> promoteLink(ObjectRow& row);

 private:
  [[nodiscard]] Result<ObjectRow> placeKnown(const Arrival& arrival, ObjectRow row);
  [[nodiscard]] Result<ObjectRow> placeNew(const Arrival& arrival, const Slot& slot,
                                           std::string handle);
  /// Takes over a row that came to be while its arrival was under way, with the document that the
  /// arrival inherited.
  [[nodiscard]] Result<ObjectRow> adopt(const Arrival& arrival, ObjectRow row,
                                        std::optional<std::uint32_t> document);
  [[nodiscard]] Result<ObjectRow> moveTo(const Arrival& arrival, ObjectRow row, bool changedKind);
  /// Takes note of a folder that was not anywhere before.
  [[nodiscard]] Result<void> noteArrival(const ObjectRow& row, const std::optional<Location>& from);
  [[nodiscard]] Result<void> tellChange(const ObjectRow& row, const Location& location,
                                        bool changedKind);
  [[nodiscard]] Result<bool> isFurtherLink(const Arrival& arrival, ObjectRow& row);

  /// A document ID that an arrival takes over; nothing when it takes none.
  using Inheritance = Result<std::optional<std::uint32_t>>;
  /// Takes names and document from the former holder of the arrival's inode number.
  [[nodiscard]] Inheritance retire(ObjectRow former, const Arrival& arrival);
  /// The document of what the index has under the arrival's name, which is free afterwards, or
  /// else the one that waits there.
  [[nodiscard]] Inheritance inherit(const Arrival& arrival, std::uint64_t arrivingSlot,
                                    std::uint32_t ownDocument);
  [[nodiscard]] Inheritance vacate(const Arrival& arrival, std::uint64_t arrivingSlot);
  [[nodiscard]] Inheritance settleOccupant(const Arrival& arrival, ObjectRow occupant);
  [[nodiscard]] Inheritance takeHandover(const Arrival& arrival, std::uint32_t ownDocument);
  /// Takes the holder's document, 0 where it has none, and tells that it did.
  [[nodiscard]] Result<std::uint32_t> take(ObjectRow& holder);
  /// Takes the document from a backup, which gets one of its own.
  [[nodiscard]] Inheritance handOver(ObjectRow backup);
  /// Whether the object stands under another name than the one it lost; its row then has that.
  [[nodiscard]] Result<bool> hasOtherName(ObjectRow& row, const Location& lost);
  /// Whether a further name of the object still stands for it.
  [[nodiscard]] Result<bool> stands(const ObjectRow& row, const Location& name) const;
  [[nodiscard]] Result<void> dropLinks(std::uint64_t slot);
  [[nodiscard]] Result<void> ensureDocument(ObjectRow& row);
  /// Writes the row and answers it.
  [[nodiscard]] Result<ObjectRow> put(ObjectRow row);
  /// The same for one whose place and identities have not changed.
  [[nodiscard]] Result<ObjectRow> putState(ObjectRow row);

  IdentityStore& store_;
  IdentifierAllocator& allocator_;
  ChangeRecorder& recorder_;
  ObjectFinder& finder_;
  const MonitoredRoots& roots_;
  const IndexedPaths& paths_;
  FolderIdentities& folders_;
  std::uint64_t device_;
  std::function<bool(std::string_view)> isPackageName_;
  ObjectFinder::Others others_;
  std::set<std::uint32_t> takenDocuments_;
  std::set<std::uint64_t> arrivedFolders_;
  std::vector<std::uint64_t> moving_;  // file IDs of what is between two places
  int depth_ = 0;
};

}  // namespace mirabel
