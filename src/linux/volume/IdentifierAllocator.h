#pragma once

#include <cstdint>

#include "linux/volume/IdentityStore.h"
#include "linux/volume/Witness.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Hands out document IDs and upper file IDs, each once in the life of the volume. A block of them
/// is noted in the witness before the first of it is handed out, so that even a lost database
/// gives none a second time. Used under the lock of the index.
class IdentifierAllocator {
 public:
  /// Both outlive it. The counters start behind everything that either of them knows.
  [[nodiscard]] static Result<IdentifierAllocator> open(IdentityStore& store, Witness& witness,
                                                        const StateFolder& folder);

  /// Errors: POSIX EOVERFLOW when all 2^32 - 1 document IDs have been given; those of writing
  /// the witness.
  [[nodiscard]] Result<std::uint32_t> nextDocumentID();
  [[nodiscard]] Result<std::uint64_t> nextFileID();
  /// A slot for a row that has no document ID of its own; see `ObjectRow::slot`.
  [[nodiscard]] std::uint64_t nextUpperSlot() { return nextSlot_++; }

  /// Writes the counters into the transaction under way, when they have moved.
  [[nodiscard]] Result<void> save();

  /// Whether an inode number of which the index has nothing may not serve as a file ID, because it
  /// may have done so before.
  [[nodiscard]] bool isSpent(std::uint64_t inode) const {
    return inodesSpent_ || inode < spentBelow_;
  }
  /// From now on that goes for all inode numbers below `limit`.
  [[nodiscard]] Result<void> spendInodeNumbersBelow(std::uint64_t limit);
  /// Goes on behind all that the witness knows of, with file IDs of the upper range alone.
  [[nodiscard]] Result<void> spendInodeNumbers();
  /// The same where no witness says what was handed out: far away from all that the database knows
  /// of, at random, so that not even a copy that is put back twice gives an identity twice.
  [[nodiscard]] Result<void> leap();

 private:
  IdentifierAllocator(IdentityStore& store, Witness& witness, const StateFolder& folder)
      : store_(&store), witness_(&witness), folder_(&folder) {}
  /// Raises a limit of the witness, durably.
  [[nodiscard]] Result<void> reserve(std::uint64_t& limit, std::uint64_t end);

  IdentityStore* store_;
  Witness* witness_;
  const StateFolder* folder_;
  std::uint64_t nextDocument_ = 1;
  std::uint64_t nextFile_ = upperFileIDs;
  std::uint64_t nextSlot_ = upperSlots;
  std::uint64_t savedDocument_ = 0;
  std::uint64_t savedFile_ = 0;
  std::uint64_t savedSlot_ = 0;
  std::uint64_t spentBelow_ = 0;
  bool inodesSpent_ = false;
};

}  // namespace mirabel
