#include "linux/volume/VolumeState.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::string_view databaseName = "volume.db";
constexpr std::string_view logName = "volume.db-wal";
// Left behind by a process that met damage while it ran, for the next one to act on.
constexpr std::string_view damageMark = "damaged";

bool exists(const StateFolder& folder, std::string_view name) {
  struct stat status {};
  return ::fstatat(folder.descriptor(), std::string(name).c_str(), &status, AT_SYMLINK_NOFOLLOW) ==
         0;
}

struct FileStamp {
  std::uint64_t size;
  std::int64_t time;
};

std::optional<FileStamp> stampOf(const std::string& path) {
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0) return std::nullopt;
  return FileStamp{static_cast<std::uint64_t>(status.st_size),
                   status.st_mtim.tv_sec * 1'000'000'000 + status.st_mtim.tv_nsec};
}

bool isCorruption(const Error& error) {
  if (error.domain != ErrorDomain::store) return false;
  const auto code = error.code & 0xFF;
  return code == SQLITE_CORRUPT || code == SQLITE_NOTADB || code == SQLITE_FORMAT;
}

bool isInputOutput(const Error& error) {
  return error.domain == ErrorDomain::store && (error.code & 0xFF) == SQLITE_IOERR;
}

Result<void> quickCheck(Database& database) {
  auto statement = database.prepare("PRAGMA quick_check(1)");
  if (!statement) return fail(statement.error());
  StatementScope scope(*statement);
  auto row = statement->step();
  if (!row) return fail(row.error());
  if (!*row || statement->blob(0) != "ok") {
    return fail(Error::store(SQLITE_CORRUPT, std::string(statement->blob(0))));
  }
  return {};
}

}  // namespace

Result<std::unique_ptr<VolumeState>> VolumeState::open(StateFolder folder, const Notice& notice) {
  std::unique_ptr<VolumeState> state(new VolumeState(std::move(folder)));
  if (auto witness = Witness::read(state->folder_)) {
    state->witness_ = *witness;
    state->hasWitness_ = true;
  }
  bool isNew = !exists(state->folder_, databaseName);
  const Trust trust = isNew ? Trust::asClosed : state->assess();
  auto opened = trust == Trust::damaged ? fail(Error::store(SQLITE_CORRUPT, "marked as damaged"))
                                        : state->openDatabase(trust);
  if (!opened && isCorruption(opened.error())) {
    if (auto aside = state->setAside(notice); !aside) return fail(aside.error());
    isNew = true;
    opened = state->openDatabase(Trust::asClosed);
  }
  if (!opened) return fail(opened.error());
  if (auto adopted = state->adoptHistory(isNew, trust, notice); !adopted) {
    return fail(adopted.error());
  }
  return state;
}

VolumeState::~VolumeState() {
  closeInOrder();
}

// Opening ---------------------------------------------------------------------------------------

VolumeState::Trust VolumeState::assess() const {
  if (exists(folder_, damageMark)) return Trust::damaged;
  if (!hasWitness_) return Trust::notClosed;
  // Without the log, what was written last may be missing.
  if (witness_.closedDigest == 0) {
    return exists(folder_, logName) ? Trust::notClosed : Trust::logLost;
  }
  const std::string path = folder_.file(databaseName);
  const auto stamp = stampOf(path);
  if (stamp && stamp->size == witness_.closedSize && stamp->time == witness_.closedTime) {
    return Trust::asClosed;
  }
  const auto digest = digestOfFile(path);
  return digest && *digest == witness_.closedDigest ? Trust::asClosed : Trust::changed;
}

Result<void> VolumeState::setAside(const Notice& notice) {
  allocator_.reset();
  journal_.reset();
  store_.reset();
  database_.reset();
  std::string aside;
  for (int number = 1;; ++number) {
    aside = std::string(databaseName) + ".damaged-" + std::to_string(number);
    if (!exists(folder_, aside)) break;
  }
  const int directory = folder_.descriptor();
  for (const std::string& suffix : {std::string("-wal"), std::string("-shm"), std::string()}) {
    const std::string from = std::string(databaseName) + suffix;
    if (!exists(folder_, from)) continue;
    if (::renameat(directory, from.c_str(), directory, (aside + suffix).c_str()) != 0) {
      return fail(Error::posix(errno, folder_.file(from)));
    }
  }
  ::unlinkat(directory, std::string(damageMark).c_str(), 0);
  if (notice) {
    notice("the volume's database is damaged; it was set aside as \"" + folder_.file(aside) +
           "\" and a new one was begun, with new identities");
  }
  return {};
}

Result<void> VolumeState::openDatabase(Trust trust) {
  // SQLite gives its log the mode of the database.
  const UniqueFd made(::openat(folder_.descriptor(), std::string(databaseName).c_str(),
                               O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!made) return fail(Error::posix(errno, folder_.file(databaseName)));
  auto database = Database::open(folder_.file(databaseName));
  if (!database) return fail(database.error());
  if (trust != Trust::asClosed) {
    if (auto checked = quickCheck(**database); !checked) return fail(checked.error());
  }
  auto store = IdentityStore::open(**database);
  if (!store) return fail(store.error());
  if (trust == Trust::changed) {
    // Sound, but not what was closed last: an older copy has an older session, beside an older
    // witness it is newer, and anything else was changed where the check does not look.
    auto session = (*store)->number("session");
    if (!session) return fail(session.error());
    if (session->value_or(0) == witness_.session) {
      return fail(Error::store(SQLITE_CORRUPT, "the database was changed from outside"));
    }
  }
  auto journal = EventJournal::open(**database);
  if (!journal) return fail(journal.error());
  database_ = std::move(*database);
  journal_ = std::move(*journal);
  store_ = std::move(*store);
  return {};
}

bool VolumeState::isOutdated(const std::optional<UUID>& history, std::uint64_t session,
                             Trust trust) const {
  if (!hasWitness_) return false;
  return !history || *history != witness_.history || session < witness_.session ||
         trust == Trust::logLost;
}

Result<void> VolumeState::adoptHistory(bool isNew, Trust trust, const Notice& notice) {
  auto history = store_->historyUUID();
  if (!history) return fail(history.error());
  auto session = store_->number("session");
  if (!session) return fail(session.error());
  const bool isFirst = isNew && !hasWitness_ && !exists(folder_, "volume.db.damaged-1");
  const bool isOlder = !isNew && isOutdated(*history, session->value_or(0), trust);
  const bool isLost = isNew && !isFirst;
  if (!isNew && !isOlder && *history) {
    if (!hasWitness_) witness_ = Witness{**history};
    witness_.session = std::max(witness_.session, session->value_or(0));
    auto allocator = IdentifierAllocator::open(*store_, witness_, folder_);
    if (!allocator) return fail(allocator.error());
    allocator_ = std::make_unique<IdentifierAllocator>(*allocator);
    return {};
  }
  if (isLost && !hasWitness_) {
    // Both are gone: begin in the upper half of each range, where none was given yet.
    witness_.documentLimit = std::uint64_t{1} << 31;
    witness_.fileLimit = upperFileIDs + (std::uint64_t{1} << 61);
  }
  if (isOlder && notice) {
    notice(
        "the volume's database is older than what this program wrote last; anchors and pages "
        "made with it start over");
  }
  witness_.history = UUID::random();
  witness_.session = std::max(witness_.session, session->value_or(0));
  auto allocator = IdentifierAllocator::open(*store_, witness_, folder_);
  if (!allocator) return fail(allocator.error());
  allocator_ = std::make_unique<IdentifierAllocator>(*allocator);
  return transaction([&]() -> Result<void> {
    if (auto set = store_->setHistoryUUID(witness_.history); !set) return set;
    if (isFirst) return {};
    return allocator_->spendInodeNumbers();
  });
}

// Writing ---------------------------------------------------------------------------------------

Result<void> VolumeState::transaction(const std::function<Result<void>()>& work) {
  if (broken_) return fail(*broken_);
  if (auto begun = database_->execute("BEGIN"); !begun) return begun;
  const std::int64_t changesBefore = database_->changeCount();
  Result<void> done = work();
  if (done) done = commit(changesBefore);
  if (done) return done;
  noteFailure(done.error());
  if (auto undone = database_->execute("ROLLBACK"); !undone) {
    logDebug("can't roll back; " + undone.error().description());
  }
  if (auto reloaded = journal_->reload(); !reloaded) broken_ = reloaded.error();
  return done;
}

Result<void> VolumeState::commit(std::int64_t changesBefore) {
  if (database_->changeCount() == changesBefore) return database_->execute("COMMIT");
  if (auto saved = allocator_->save(); !saved) return saved;
  if (auto saved = journal_->saveBounds(); !saved) return saved;
  const bool isFirst = !hasWritten_;
  if (isFirst) {
    if (auto begun = beginSession(); !begun) return begun;
  }
  if (auto committed = database_->execute("COMMIT"); !committed) return committed;
  if (!isFirst) return {};
  // Only now is the session in the database; a witness ahead of it would call it an older copy.
  hasWritten_ = true;
  ++witness_.session;
  return witness_.write(folder_);
}

Result<void> VolumeState::beginSession() {
  witness_.closedDigest = 0;
  if (auto written = witness_.write(folder_); !written) return written;
  return store_->setNumber("session", witness_.session + 1);
}

void VolumeState::noteFailure(const Error& error) {
  // A failed sync leaves unknown what is on disk: nothing more is written, the next start checks.
  if (isInputOutput(error)) broken_ = error;
  if (!isCorruption(error)) return;
  broken_ = error;
  UniqueFd mark(::openat(folder_.descriptor(), std::string(damageMark).c_str(),
                         O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
}

void VolumeState::closeInOrder() {
  allocator_.reset();
  journal_.reset();
  store_.reset();
  if (!database_ || !hasWritten_) return;
  if (broken_ || !database_->checkpoint()) return;
  const std::string path = folder_.file(databaseName);
  const auto stamp = stampOf(path);
  const auto digest = digestOfFile(path);
  if (!stamp || !digest) return;
  witness_.closedSize = stamp->size;
  witness_.closedTime = stamp->time;
  witness_.closedDigest = *digest;
  if (auto written = witness_.write(folder_); !written) {
    logDebug("can't write the volume's witness; " + written.error().description());
  }
}

}  // namespace mirabel
