#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "foundation/Error.h"
#include "linux/volume/Database.h"
#include "linux/volume/EventJournal.h"
#include "linux/volume/IdentifierAllocator.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/StateFolder.h"
#include "linux/volume/Witness.h"

namespace mirabel {

/// What is kept of a volume: its database, and the witness beside it. Opens both, finds out
/// whether the database can be trusted, and wraps changes in transactions. Used under the lock of
/// the index.
///
/// A database that does not check out is renamed to "volume.db.damaged-N" and a new one begun; so
/// is one that was lost. One that turns out to be an older copy, or to have lost its log, is kept.
/// In all these cases the history gets a new UUID, document IDs go on behind the last that may have
/// been given, and inode numbers no longer serve as file IDs: no identity of before is given to
/// another thing.
class VolumeState {
 public:
  using Notice = std::function<void(std::string_view)>;

  [[nodiscard]] static Result<std::unique_ptr<VolumeState>> open(StateFolder folder,
                                                                 const Notice& notice);
  /// Closes the database in order and notes its digest in the witness.
  ~VolumeState();
  VolumeState(const VolumeState&) = delete;
  VolumeState& operator=(const VolumeState&) = delete;

  [[nodiscard]] IdentityStore& store() { return *store_; }
  [[nodiscard]] IdentifierAllocator& allocator() { return *allocator_; }
  [[nodiscard]] EventJournal& journal() { return *journal_; }
  [[nodiscard]] const UUID& history() const { return witness_.history; }

  /// Runs `work` in a transaction. What it wrote is on disk when this returns without an error,
  /// and nothing of it otherwise. After an I/O error of the database every call fails.
  [[nodiscard]] Result<void> transaction(const std::function<Result<void>()>& work);

 private:
  explicit VolumeState(StateFolder folder) : folder_(std::move(folder)) {}

  /// What the witness says of the database file before it is opened.
  enum class Trust { asClosed, notClosed, logLost, changed, damaged };
  [[nodiscard]] Trust assess() const;
  [[nodiscard]] Result<void> setAside(const Notice& notice);
  [[nodiscard]] Result<void> openDatabase(Trust trust);
  [[nodiscard]] bool isOutdated(const std::optional<UUID>& history, std::uint64_t session,
                                Trust trust) const;
  [[nodiscard]] Result<void> adoptHistory(bool isNew, Trust trust, const Notice& notice);
  [[nodiscard]] Result<void> beginSession();
  [[nodiscard]] Result<void> commit(std::int64_t changesBefore);
  void noteFailure(const Error& error);
  void closeInOrder();

  StateFolder folder_;
  Witness witness_;
  bool hasWitness_ = false;
  std::unique_ptr<Database> database_;
  std::unique_ptr<IdentityStore> store_;
  std::unique_ptr<EventJournal> journal_;
  std::unique_ptr<IdentifierAllocator> allocator_;
  bool hasWritten_ = false;
  std::optional<Error> broken_;
};

}  // namespace mirabel
