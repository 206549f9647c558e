#include "linux/volume/FolderReading.h"

#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/SplitWork.h"
#include "foundation/ThreadPool.h"
#include "linux/volume/IndexContext.h"

namespace mirabel {
namespace {

constexpr std::size_t pieceSize = 64;

bool isDots(std::string_view name) {
  return name == "." || name == "..";
}

// The handle must be that of the object whose status was read.
void readHandle(int folder, Sighting& entry) {
  auto handle = handleAt(folder, entry.name);
  const auto now = statusAt(folder, entry.name);
  const bool isIt =
      now && now->inode == entry.status.inode && now->birthTime == entry.status.birthTime;
  if (isIt) entry.handle = std::move(handle).value_or("");
}

Result<void> readNames(FolderReading& reading) {
  reading.entries.clear();
  while (reading.directory && reading.entries.size() < entriesPerTransaction) {
    auto entry = reading.directory->next();
    if (!entry) return fail(entry.error());
    // Readings that wait their turn hold no more than they need.
    if (!*entry) reading.directory.reset();
    if (!*entry || isDots((*entry)->name)) continue;
    reading.entries.push_back({std::string((*entry)->name), {}, false});
  }
  return {};
}

}  // namespace

Result<FolderReading> beginReading(UniqueFd folder) {
  // Open anew, now that it is watched: btrfs gives what was there when a folder was opened, and
  // what came between that and the mark would be in neither.
  UniqueFd reading(::openat(folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!reading) return fail(Error::posix(errno));
  auto status = statusAt(folder.get(), "");
  if (!status) return fail(status.error());
  return FolderReading{std::move(folder), *status, RawDirectory(std::move(reading))};
}

Result<void> readNext(FolderReading& reading) {
  if (auto named = readNames(reading); !named) return named;
  std::vector<Sighting>& entries = reading.entries;
  std::vector<char> isThere(entries.size(), 0);
  std::atomic<int> failure = 0;
  splitWork(entries.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      auto status = statusAt(reading.folder.get(), entries[i].name);
      if (!status && !status.error().isPosix(ENOENT) && !status.error().isPosix(EACCES)) {
        failure = static_cast<int>(status.error().code);
      }
      if (!status) continue;
      isThere[i] = 1;
      entries[i].status = *status;
    }
  });
  if (failure != 0) return fail(Error::posix(failure));
  std::size_t kept = 0;
  for (std::size_t i = 0; i < entries.size(); ++i) {
    if (isThere[i] == 0) continue;
    if (kept != i) entries[kept] = std::move(entries[i]);
    ++kept;
  }
  entries.resize(kept);
  return {};
}

namespace {

Result<FolderReading> read(const MonitoredRoots& roots, const FolderRequest& request,
                           FolderWatcher* watcher) {
  auto opened = roots.open(request.path, O_RDONLY | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  const int folder = opened->get();
  // Under its number it must not be another that is watched.
  const auto before = statusAt(folder, "");
  if (!before) return fail(before.error());
  if (before->inode != request.inode || before->birthTime != request.birthTime) {
    return fail(Error::posix(ESTALE));
  }
  if (watcher != nullptr) {
    if (auto watched = watcher->watch(folder, request.id); !watched) return fail(watched.error());
  }
  auto reading = beginReading(std::move(*opened));
  if (!reading) return reading;
  if (auto done = readNext(*reading); !done) return fail(done.error());
  if (!request.wantsHandles) return reading;
  for (Sighting& entry : reading->entries)
    readHandle(folder, entry);
  return reading;
}

}  // namespace

struct FolderReadAhead::Item {
  enum class State { waiting, begun, done, taken };
  FolderRequest request;
  FolderWatcher* watcher;
  State state = State::waiting;  // with the mutex
  std::optional<FolderReading> reading{};
};

struct FolderReadAhead::Shared {
  explicit Shared(const MonitoredRoots& all) : roots(all) {}
  const MonitoredRoots& roots;
  std::mutex mutex;
  std::condition_variable changed;
  std::deque<Ticket> waiting;    // with mutex, as all that follows
  std::size_t entriesAhead = 0;  // read and not taken
  bool isWorking = false;        // a thread was asked for, and may have come
  bool isReading = false;

  // Ends where there is nothing to do, or enough was done for now.
  void work() {
    std::unique_lock lock(mutex);
    while (!waiting.empty() && entriesAhead < entriesPerTransaction) {
      const Ticket item = std::move(waiting.front());
      waiting.pop_front();
      if (item->state != Item::State::waiting) continue;
      item->state = Item::State::begun;
      isReading = true;
      lock.unlock();
      auto reading = read(roots, item->request, item->watcher);
      lock.lock();
      if (reading) item->reading.emplace(std::move(*reading));
      if (item->reading) entriesAhead += item->reading->entries.size();
      item->state = Item::State::done;
      isReading = false;
      changed.notify_all();
    }
    isWorking = false;
  }
};

FolderReadAhead::FolderReadAhead(const MonitoredRoots& roots)
    : shared_(std::make_shared<Shared>(roots)) {}

FolderReadAhead::Ticket FolderReadAhead::ask(FolderRequest request, FolderWatcher* watcher) {
  auto item = std::make_shared<Item>(std::move(request), watcher);
  const std::lock_guard lock(shared_->mutex);
  shared_->waiting.push_back(item);
  goOn();
  return item;
}

void FolderReadAhead::goOn() {
  // Waking a thread costs as much as reading some folders.
  const bool hasRoom = shared_->entriesAhead <= entriesPerTransaction / 2;
  if (shared_->isWorking || shared_->waiting.empty() || !hasRoom) return;
  shared_->isWorking = true;
  ThreadPool::shared().submit([shared = shared_] { shared->work(); });
}

std::optional<FolderReading> FolderReadAhead::take(const Ticket& ticket) {
  std::unique_lock lock(shared_->mutex);
  shared_->changed.wait(lock, [&] { return ticket->state != Item::State::begun; });
  ticket->state = Item::State::taken;
  if (ticket->reading) shared_->entriesAhead -= ticket->reading->entries.size();
  goOn();
  return std::exchange(ticket->reading, std::nullopt);
}

void FolderReadAhead::stop() {
  std::unique_lock lock(shared_->mutex);
  shared_->waiting.clear();
  // A thread that has not come yet will find nothing to do: it need not be waited for.
  shared_->changed.wait(lock, [&] { return !shared_->isReading; });
  shared_->entriesAhead = 0;
}

}  // namespace mirabel
