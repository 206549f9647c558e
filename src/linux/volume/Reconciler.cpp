#include "linux/volume/Reconciler.h"

#include <cerrno>
#include <fcntl.h>
#include <unordered_set>
#include <utility>

#include "foundation/SplitWork.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

// One transaction's worth of entries.
constexpr std::size_t batchSize = 4096;
constexpr std::size_t pieceSize = 64;

bool isDots(std::string_view name) {
  return name == "." || name == "..";
}

// A folder of the volume that is open for reading; nothing for one that can't be, and for what is
// mounted or is a volume of its own below a root.
std::optional<UniqueFd> openFolder(const MonitoredRoots& roots, const std::string& path,
                                   std::uint64_t device) {
  auto folder = roots.open(path, O_RDONLY | O_DIRECTORY);
  if (!folder) return std::nullopt;
  const auto status = statusAt(folder->get(), "");
  if (!status || status->device != device) return std::nullopt;
  return std::move(*folder);
}

}  // namespace

Reconciler::Reconciler(Learner& learner, IdentityStore& store, ChangeRecorder& recorder,
                       const MonitoredRoots& roots, std::uint64_t device,
                       std::function<bool(std::string_view)> isPackageName)
    : learner_(learner),
      store_(store),
      recorder_(recorder),
      roots_(roots),
      device_(device),
      isPackageName_(std::move(isPackageName)) {}

Result<void> Reconciler::run(const Transaction& transaction) {
  pending_.clear();
  missing_.clear();
  for (std::size_t i = 0; i < roots_.paths().size(); ++i) {
    if (roots_.descriptor(i) < 0) continue;
    auto learned = transaction([&]() -> Result<void> {
      auto id = learner_.folderID(roots_.paths()[i], roots_.descriptor(i));
      if (!id) return fail(id.error());
      pending_.push_back({roots_.paths()[i], *id});
      return {};
    });
    if (!learned) return learned;
  }
  while (!pending_.empty()) {
    const Folder folder = std::move(pending_.back());
    pending_.pop_back();
    if (auto done = transaction([&] { return reconcileFolder(folder); }); !done) return done;
  }
  // Only now is it known that what is missing did not turn up elsewhere.
  return transaction([&]() -> Result<void> {
    for (const Missing& missing : missing_) {
      if (auto settled = settle(missing); !settled) return settled;
    }
    return {};
  });
}

Result<void> Reconciler::reconcileFolder(const Folder& folder) {
  auto opened = openFolder(roots_, folder.path, device_);
  std::uint64_t names = 0;
  if (opened) {
    const int descriptor = opened->get();
    RawDirectory directory(std::move(*opened));
    std::vector<Sighting> batch;
    while (true) {
      auto entry = directory.next();
      if (!entry) return fail(entry.error());
      if (*entry && !isDots((*entry)->name)) {
        batch.push_back({std::string((*entry)->name), {}, false});
      }
      if (batch.size() < batchSize && *entry) continue;
      auto taken = takeIn(folder, descriptor, batch);
      if (!taken) return fail(taken.error());
      names += *taken;
      batch.clear();
      if (!*entry) break;
    }
  }
  auto known = store_.nameCount(folder.id);
  if (!known) return fail(known.error());
  return *known == names ? Result<void>() : findMissing(folder);
}

Result<std::uint64_t> Reconciler::takeIn(const Folder& folder, int descriptor,
                                         std::vector<Sighting>& batch) {
  std::vector<char> isThere(batch.size(), 0);
  splitWork(batch.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      auto status = statusAt(descriptor, batch[i].name);
      if (!status) continue;
      isThere[i] = 1;
      batch[i].status = *status;
    }
  });
  std::size_t kept = 0;
  for (std::size_t i = 0; i < batch.size(); ++i) {
    if (isThere[i] == 0) continue;
    if (kept != i) batch[kept] = std::move(batch[i]);
    Sighting& sighting = batch[kept++];
    sighting.isPackage = sighting.status.kind == FileKind::folder && isPackageName_(sighting.name);
  }
  batch.resize(kept);
  if (auto learned = learner_.learn(folder.path, descriptor, batch); !learned) {
    return fail(learned.error());
  }
  std::uint64_t placed = 0;
  for (const Sighting& sighting : batch) {
    if (sighting.fileID == 0) continue;
    ++placed;
    if (sighting.status.kind == FileKind::folder && sighting.status.device == device_) {
      pending_.push_back({folder.path + "/" + sighting.name, sighting.fileID});
    }
  }
  return placed;
}

Result<void> Reconciler::findMissing(const Folder& folder) {
  std::unordered_set<std::string> names;
  if (auto opened = openFolder(roots_, folder.path, device_)) {
    RawDirectory directory(std::move(*opened));
    while (true) {
      auto entry = directory.next();
      if (!entry) return fail(entry.error());
      if (!*entry) break;
      names.emplace((*entry)->name);
    }
  }
  auto children = store_.childrenOf(folder.id);
  if (!children) return fail(children.error());
  for (ObjectRow& child : *children) {
    if (names.contains(child.location->name)) continue;
    missing_.push_back({child.slot, std::move(*child.location), false});
  }
  auto links = store_.linksIn(folder.id);
  if (!links) return fail(links.error());
  for (auto& [name, slot] : *links) {
    if (!names.contains(name)) missing_.push_back({slot, {folder.id, std::move(name)}, true});
  }
  return {};
}

Result<void> Reconciler::settle(const Missing& missing) {
  auto row = store_.objectInSlot(missing.slot);
  if (!row) return fail(row.error());
  if (missing.isLink) {
    auto removed = store_.removeLink(missing.location.folder, missing.location.name);
    if (!removed || !*row) return removed;
    return recorder_.changed(**row, missing.location);
  }
  if (!*row || (*row)->location != missing.location) return {};
  return learner_.leave(std::move(**row));
}

}  // namespace mirabel
