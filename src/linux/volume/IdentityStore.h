#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/volume/Database.h"
#include "linux/volume/FolderPaths.h"
#include "linux/volume/ObjectRow.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

struct IdentityStatements;

/// What the quick look-up of a listing answers: nothing is known of the inode number, or something
/// else than what is seen, or just that.
enum class Knowledge { none, different, unchanged };
struct KnownObject {
  Knowledge knowledge = Knowledge::none;
  std::uint64_t fileID = 0;  ///< this and the next only when unchanged
  std::uint32_t documentID = 0;
};

/// A document that waits under a name for the next file, or package, to come: its own was renamed
/// to a backup of itself, or is gone.
struct Handover {
  std::uint32_t documentID = 0;
  ObjectKind kind = ObjectKind::regular;
};

/// Slots of rows that are not named by their document ID.
inline constexpr std::uint64_t upperSlots = std::uint64_t{1} << 32;

/// File IDs at and above this are given to objects whose inode number cannot be theirs.
inline constexpr std::uint64_t upperFileIDs = std::uint64_t{1} << 62;

/// The tables of the volume's database, one method per statement. All errors are of
/// `ErrorDomain::store`. Used under the lock of the index, inside its transactions.
class IdentityStore {
 public:
  /// Makes the tables where they are missing. Fails on a database of a later schema.
  [[nodiscard]] static Result<std::unique_ptr<IdentityStore>> open(Database& database);
  ~IdentityStore();

  [[nodiscard]] Result<std::optional<ObjectRow>> objectInSlot(std::uint64_t slot);
  /// The object that has, or had last, an inode number of the volume itself.
  [[nodiscard]] Result<std::optional<ObjectRow>> objectByInode(std::uint64_t inode);
  [[nodiscard]] Result<std::optional<ObjectRow>> objectByFileID(std::uint64_t fileID);
  [[nodiscard]] Result<std::optional<ObjectRow>> objectByDocumentID(std::uint32_t documentID);
  [[nodiscard]] Result<std::optional<ObjectRow>> objectAt(std::uint64_t folder,
                                                          std::string_view name);
  [[nodiscard]] Result<std::optional<ObjectRow>> foreignObject(std::uint64_t fileSystem,
                                                               std::uint64_t inode);
  /// Compares the volume's object of that inode number with an entry: unchanged when it was last
  /// seen under this very name, with these times, and is that object for sure.
  [[nodiscard]] Result<KnownObject> compareEntry(std::uint64_t inode, std::uint64_t folder,
                                                 std::string_view name, ObjectKind kind,
                                                 std::int64_t birthTime, std::int64_t changeTime);
  /// Ends the run of comparisons; to be called before the transaction ends or rows are written.
  void endComparing();
  /// Whether the index has anything under that name: an object, a link or a handover.
  [[nodiscard]] Result<bool> isOccupied(std::uint64_t folder, std::string_view name);
  /// Whether it may have anything in that folder.
  [[nodiscard]] Result<bool> hasNames(std::uint64_t folder);
  /// Writes a row that has its slot. Fails when another object has its document or its inode.
  [[nodiscard]] Result<void> insert(const ObjectRow& row);
  [[nodiscard]] Result<void> put(const ObjectRow& row);
  /// Writes kind, times and size of a row whose place and identities have not changed.
  [[nodiscard]] Result<void> putState(const ObjectRow& row);
  [[nodiscard]] Result<void> remove(std::uint64_t slot);

  /// Paths that follow from the rows; to be cleared after a rollback.
  [[nodiscard]] FolderPaths& folderPaths() { return folderPaths_; }

  /// What lies in a folder, further links not counted.
  [[nodiscard]] Result<std::vector<ObjectRow>> childrenOf(std::uint64_t folder);
  /// How many names the index has in a folder, further links among them.
  [[nodiscard]] Result<std::uint64_t> nameCount(std::uint64_t folder);

  /// False when no object has further names, for sure.
  [[nodiscard]] bool mayHaveLinks() const { return mayHaveLinks_; }
  /// Further names of hard-linked objects.
  [[nodiscard]] Result<std::optional<std::uint64_t>> linkAt(std::uint64_t folder,
                                                            std::string_view name);
  [[nodiscard]] Result<std::vector<Location>> links(std::uint64_t slot);
  /// Names and slots of the links in a folder.
  [[nodiscard]] Result<std::vector<std::pair<std::string, std::uint64_t>>> linksIn(
      std::uint64_t folder);
  [[nodiscard]] Result<void> addLink(const Location& location, std::uint64_t slot);
  [[nodiscard]] Result<void> removeLink(std::uint64_t folder, std::string_view name);

  [[nodiscard]] Result<std::optional<Handover>> handoverAt(std::uint64_t folder,
                                                           std::string_view name);
  [[nodiscard]] Result<std::vector<Location>> handoversOf(std::uint32_t documentID);
  /// In place of whatever was noted at the location before.
  [[nodiscard]] Result<void> addHandover(const Location& location, const Handover& handover);
  [[nodiscard]] Result<void> removeHandovers(std::uint32_t documentID);

  [[nodiscard]] Result<std::optional<std::uint64_t>> number(std::string_view key);
  [[nodiscard]] Result<void> setNumber(std::string_view key, std::uint64_t value);
  [[nodiscard]] Result<std::optional<UUID>> historyUUID();
  [[nodiscard]] Result<void> setHistoryUUID(const UUID& uuid);

 private:
  explicit IdentityStore(Database& database);
  [[nodiscard]] Result<void> make();
  [[nodiscard]] Result<void> prepare();
  [[nodiscard]] Result<std::optional<ObjectRow>> readObject(Statement& statement);
  [[nodiscard]] static ObjectRow objectIn(const Statement& statement);
  [[nodiscard]] Result<bool> stepTo(std::uint64_t inode);
  [[nodiscard]] Result<void> write(Statement& statement, const ObjectRow& row);

  [[nodiscard]] static Result<std::vector<Location>> readLocations(Statement& statement);

  Database& database_;
  FolderPaths folderPaths_;
  std::unique_ptr<IdentityStatements> statements_;
  // Most homes have neither; then nobody needs to ask.
  bool mayHaveLinks_ = true;
  bool mayHaveHandovers_ = true;
  bool isComparing_ = false;  ///< the statement `following` stands on a row
};

}  // namespace mirabel
