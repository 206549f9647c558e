#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "linux/volume/Database.h"
#include "linux/volume/DatabaseFiles.h"
#include "linux/volume/EventJournal.h"
#include "linux/volume/IdentifierAllocator.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/StateFolder.h"
#include "linux/volume/Witness.h"
#include "mirabel/Error.h"

namespace mirabel {

/// What is kept of a volume: its database, and the witness beside it. Opens both, finds out
/// whether the database can be trusted, and wraps changes in transactions. Used under the lock of
/// the index.
///
/// The history goes on only when it is known that nothing acknowledged is missing. Each
/// transaction counts itself in the database, and the witness notes the count when it is on disk:
///
/// - The database has that count, or one more: it is the newest. The one more was written when the
///   process was killed before it could acknowledge it, and was told to nobody.
/// - It has less: it is an older copy, or its log was cut, lost or damaged. Replaying it would
///   leave out what the lost part told, identities among it: the history starts over.
/// - There is no witness, or the witness is a copy: the whole state was put back, and nobody knows
///   from when. The history starts over.
/// - The database file holds less than what was moved into it from earlier logs: it was put back
///   under a log that does not fit it. The history starts over.
/// - A page has not the sum that it ought to have: the database is renamed to
///   "volume.db.damaged-N", and a new one is begun. So it is when the database was removed.
///
/// To start over means: the history gets a new UUID, so that no anchor of before is answered,
/// however far its event IDs have come; identities that are known are kept; new document IDs are
/// above all that may have been given, and inode numbers no longer serve as file IDs.
class VolumeState {
 public:
  using Notice = std::function<void(std::string_view)>;
  using Broken = std::function<void(std::string_view why)>;

  /// `broken` is called once, when an I/O error of the database or damage was met after it was
  /// opened, or its folder is gone: every transaction fails from then on, until the state is opened
  /// anew, which finds out what can be trusted. It is called under the lock of the index.
  [[nodiscard]] static Result<std::unique_ptr<VolumeState>> open(StateFolder folder,
                                                                 const Notice& notice,
                                                                 Broken broken = {});
  /// Closes the database in order and notes in the witness how it was left.
  ~VolumeState();
  VolumeState(const VolumeState&) = delete;
  VolumeState& operator=(const VolumeState&) = delete;

  [[nodiscard]] IdentityStore& store() { return *store_; }
  [[nodiscard]] IdentifierAllocator& allocator() { return *allocator_; }
  [[nodiscard]] EventJournal& journal() { return *journal_; }
  [[nodiscard]] Database& database() { return *database_; }
  [[nodiscard]] const StateFolder& folder() const { return folder_; }
  /// Transactions that wrote something.
  [[nodiscard]] std::uint64_t commits() const { return commits_; }
  [[nodiscard]] bool isBroken() const { return broken_.has_value(); }
  [[nodiscard]] const UUID& history() const { return witness_.history; }

  /// Whether it can still be answered from: an error when it is broken, which it is as well when
  /// its folder was deleted, or another came to its place.
  [[nodiscard]] Result<void> stayUsable();
  /// Runs `work` in a transaction. What it wrote is on disk when this returns without an error,
  /// and nothing of it otherwise. A lack of room passes: the next call may succeed.
  [[nodiscard]] Result<void> transaction(const std::function<Result<void>()>& work);
  /// Gives back the memory that longer work has left full. Not inside a transaction.
  void releaseMemory();

 private:
  VolumeState(StateFolder folder, Broken broken)
      : folder_(std::move(folder)), files_(folder_), tellBroken_(std::move(broken)) {}

  /// What the witness says of the database's files before they are opened.
  enum class Trust { asClosed, notClosed, incomplete, damaged };
  [[nodiscard]] Trust assess() const;
  [[nodiscard]] Result<void> setAside(const Notice& notice);
  [[nodiscard]] Result<void> openDatabase(Trust trust);
  [[nodiscard]] bool isNewest(const UUID& history, Trust trust) const;
  [[nodiscard]] Result<void> startOver(bool isFirst);
  [[nodiscard]] Result<void> commit(std::int64_t changesBefore);
  [[nodiscard]] Result<void> beginLog();
  /// Moves the log into the database; not on failure.
  [[nodiscard]] bool foldLog(Database::Log log);
  void note();
  void noteFailure(const Error& error);
  void breakOff(const Error& error, std::string_view why);
  void closeInOrder();

  StateFolder folder_;
  DatabaseFiles files_;
  Broken tellBroken_;
  Witness witness_;
  bool hasWitness_ = false;
  std::unique_ptr<Database> database_;
  std::unique_ptr<IdentityStore> store_;
  std::unique_ptr<EventJournal> journal_;
  std::unique_ptr<IdentifierAllocator> allocator_;
  std::uint64_t commits_ = 0;  ///< transactions that the database holds
  bool isAdopted_ = false;     ///< the witness is of this database
  bool isAsClosed_ = false;    ///< it was when opened as the witness says
  bool hasWritten_ = false;
  bool isLogBegun_ = false;  ///< the log bears the number of the next folding
  std::optional<Error> broken_;
};

}  // namespace mirabel
