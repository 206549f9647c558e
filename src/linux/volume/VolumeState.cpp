#include "linux/volume/VolumeState.h"

#include <algorithm>
#include <cerrno>
#include <malloc.h>
#include <sqlite3.h>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

// Pages in the log after which it is moved into the database, 16 MiB.
constexpr int longLog = 4000;
constexpr std::string_view failedDisk =
    "the disk failed under the volume's state; the next start checks what is there";

bool isCorruption(const Error& error) {
  if (error.domain != ErrorDomain::store) return false;
  const auto code = error.code & 0xFF;
  return code == SQLITE_CORRUPT || code == SQLITE_NOTADB || code == SQLITE_FORMAT;
}

bool isInputOutput(const Error& error) {
  return error.domain == ErrorDomain::store && (error.code & 0xFF) == SQLITE_IOERR;
}

Result<void> check(Database& database, const char* pragma) {
  auto statement = database.prepare(pragma);
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

Result<std::unique_ptr<VolumeState>> VolumeState::open(StateFolder folder, const Notice& notice,
                                                       Broken broken) {
  std::unique_ptr<VolumeState> state(new VolumeState(std::move(folder), std::move(broken)));
  if (auto witness = Witness::read(state->folder_)) {
    state->witness_ = std::move(*witness);
    state->hasWitness_ = true;
  }
  bool isNew = !state->files_.exist();
  const Trust trust = isNew ? Trust::asClosed : state->assess();
  auto opened = trust == Trust::damaged ? fail(Error::store(SQLITE_CORRUPT, "marked as damaged"))
                                        : state->openDatabase(trust);
  if (!opened && isCorruption(opened.error())) {
    if (auto aside = state->setAside(notice); !aside) return fail(aside.error());
    isNew = true;
    opened = state->openDatabase(Trust::asClosed);
  }
  if (!opened) return fail(opened.error());
  auto history = state->store_->historyUUID();
  if (!history) return fail(history.error());
  if (*history && state->isNewest(**history, trust)) {
    state->isAsClosed_ = trust == Trust::asClosed;
    state->isAdopted_ = true;
    return state;
  }
  // A first start may have failed, for want of room, before it acknowledged anything.
  const bool isFirst = !*history && state->witness_.commits == 0 && !state->files_.wereSetAside();
  if (!isNew && !isFirst && notice) {
    notice(
        "the volume's state is older than what this program wrote last, or it is not known "
        "whether it is; anchors and pages made with it start over");
  }
  if (auto begun = state->startOver(isFirst); !begun) return fail(begun.error());
  state->isAdopted_ = true;
  return state;
}

VolumeState::~VolumeState() {
  closeInOrder();
}

// Opening ---------------------------------------------------------------------------------------

VolumeState::Trust VolumeState::assess() const {
  if (files_.areMarkedAsDamaged()) return Trust::damaged;
  if (!hasWitness_ || files_.userVersion() < witness_.foldings) return Trust::incomplete;
  // Without the log, what was written last may be missing.
  if (witness_.closedSize == 0) return files_.haveLog() ? Trust::notClosed : Trust::incomplete;
  const DatabaseFiles::Stamp closed{witness_.closedSize, witness_.closedTime};
  return files_.stamp() == closed ? Trust::asClosed : Trust::notClosed;
}

Result<void> VolumeState::setAside(const Notice& notice) {
  allocator_.reset();
  journal_.reset();
  store_.reset();
  database_.reset();
  auto aside = files_.setAside();
  if (!aside) return fail(aside.error());
  if (notice) {
    notice("the volume's database is damaged; it was set aside as \"" + *aside +
           "\" and a new one was begun, with new identities");
  }
  return {};
}

Result<void> VolumeState::openDatabase(Trust trust) {
  if (auto made = files_.make(); !made) return made;
  auto database = Database::open(files_.path());
  if (!database) return fail(database.error());
  database_ = std::move(*database);
  if (trust != Trust::asClosed) {
    // Reads every page, and so checks its sum.
    if (auto sound = check(*database_, "PRAGMA quick_check(1)"); !sound) return sound;
  }
  auto store = IdentityStore::open(*database_);
  if (!store) return fail(store.error());
  store_ = std::move(*store);
  auto journal = EventJournal::open(*database_);
  if (!journal) return fail(journal.error());
  journal_ = std::move(*journal);
  auto commits = store_->number("commits");
  if (!commits) return fail(commits.error());
  commits_ = commits->value_or(0);
  if (trust == Trust::incomplete || commits_ < witness_.commits) {
    // Sound pages that may be of different times: do they fit each other?
    if (auto sound = check(*database_, "PRAGMA integrity_check(1)"); !sound) return sound;
  }
  auto allocator = IdentifierAllocator::open(*store_, witness_, folder_);
  if (!allocator) return fail(allocator.error());
  allocator_ = std::make_unique<IdentifierAllocator>(*allocator);
  return {};
}

bool VolumeState::isNewest(const UUID& history, Trust trust) const {
  return hasWitness_ && trust != Trust::incomplete && history == witness_.history &&
         commits_ >= witness_.commits;
}

Result<void> VolumeState::startOver(bool isFirst) {
  witness_.history = UUID::random();
  witness_.foldings = files_.userVersion();
  commits_ = witness_.commits = std::max(commits_, witness_.commits);
  return transaction([&]() -> Result<void> {
    if (auto set = store_->setHistoryUUID(witness_.history); !set) return set;
    if (auto emptied = journal_->startOver(); !emptied) return emptied;
    if (isFirst) return {};
    return hasWitness_ ? allocator_->spendInodeNumbers() : allocator_->leap();
  });
}

// Writing ---------------------------------------------------------------------------------------

Result<void> VolumeState::stayUsable() {
  if (!broken_ && !folder_.isInPlace()) {
    const std::string gone = "the state folder \"" + folder_.path() + "\" was deleted or replaced";
    breakOff(Error::posix(EIO, gone), gone);
  }
  return broken_ ? fail(*broken_) : Result<void>();
}

Result<void> VolumeState::transaction(const std::function<Result<void>()>& work) {
  if (broken_) return fail(*broken_);
  if (auto begun = database_->begin(); !begun) return begun;
  const std::int64_t changesBefore = database_->changeCount();
  Result<void> done = work();
  if (done) done = commit(changesBefore);
  if (done) return done;
  noteFailure(done.error());
  if (auto undone = database_->execute("ROLLBACK"); !undone) {
    logDebug("can't roll back; " + undone.error().description());
  }
  store_->folderPaths().clear();
  if (auto reloaded = journal_->reload(); !reloaded) breakOff(reloaded.error(), failedDisk);
  return done;
}

void VolumeState::releaseMemory() {
  database_->releaseMemory();
  store_->folderPaths().clear();
  // The allocator keeps what was freed in between other things, unless it is told.
  ::malloc_trim(0);
}

Result<void> VolumeState::commit(std::int64_t changesBefore) {
  if (database_->changeCount() == changesBefore) return database_->commit();
  if (auto saved = allocator_->save(); !saved) return saved;
  if (auto saved = journal_->saveBounds(); !saved) return saved;
  if (auto counted = store_->setNumber("commits", commits_ + 1); !counted) return counted;
  if (!isLogBegun_) {
    if (auto begun = beginLog(); !begun) return begun;
  }
  if (auto committed = database_->commit(); !committed) return committed;
  isLogBegun_ = hasWritten_ = true;
  // Only now: a witness ahead of the database would call it an older copy.
  witness_.commits = ++commits_;
  note();
  if (database_->logPages() >= longLog) static_cast<void>(foldLog(Database::Log::kept));
  return {};
}

// The log bears a number that comes into the database file with the rest of it: a file without it
// is not the one that the next log goes on from.
Result<void> VolumeState::beginLog() {
  if (!hasWritten_) {
    witness_.closedSize = 0;
    if (auto written = witness_.write(folder_); !written) return written;
  }
  const std::string number = std::to_string(witness_.foldings + 1);
  return database_->execute(("PRAGMA user_version=" + number).c_str());
}

bool VolumeState::foldLog(Database::Log log) {
  if (auto folded = database_->checkpoint(log); !folded) {
    noteFailure(folded.error());
    return false;
  }
  isLogBegun_ = false;
  witness_.foldings = files_.userVersion();
  note();
  return true;
}

void VolumeState::note() {
  if (auto noted = witness_.note(); !noted) {
    logDebug([&] { return "can't note in the volume's witness; " + noted.error().description(); });
  }
}

void VolumeState::noteFailure(const Error& error) {
  // A failed sync leaves unknown what is on disk: nothing more is written, whoever opens it next
  // checks.
  if (isCorruption(error)) files_.markAsDamaged();
  if (isCorruption(error) || isInputOutput(error)) breakOff(error, failedDisk);
}

void VolumeState::breakOff(const Error& error, std::string_view why) {
  if (broken_) return;
  broken_ = error;
  logError("the volume's state can't be used before it was opened anew; " + error.description());
  if (isAdopted_ && tellBroken_) tellBroken_(why);
}

void VolumeState::closeInOrder() {
  allocator_.reset();
  journal_.reset();
  store_.reset();
  if (!database_ || !isAdopted_) return;
  // Not all that reads does so in a transaction.
  if (database_->metDamage()) return files_.markAsDamaged();
  if (broken_ || (isAsClosed_ && !hasWritten_)) return;
  if (!foldLog(Database::Log::emptied)) return;
  const auto stamp = files_.stamp();
  if (!stamp) return;
  witness_.closedSize = stamp->size;
  witness_.closedTime = stamp->modificationTime;
  if (auto written = witness_.write(folder_); !written) {
    logDebug("can't write the volume's witness; " + written.error().description());
  }
}

}  // namespace mirabel
