// Finding again what is not where the index has it.
#include <utility>
#include <vector>

#include "foundation/LookFailure.h"
#include "linux/volume/DiskEntry.h"
#include "linux/volume/Learner.h"

namespace mirabel {

Result<std::optional<std::string>> Learner::verify(const ObjectRow& row) {
  if (!row.location) return std::nullopt;
  return paths_.standingPath(row, *row.location);
}

// Another folder may have come to the path of the root.
Result<void> Learner::settleRoot(const std::vector<std::uint64_t>& foldersAbove) {
  if (foldersAbove.empty()) return {};
  auto outermost = store_.objectByFileID(foldersAbove.front());
  if (!outermost) return fail(outermost.error());
  if (!*outermost || !(*outermost)->location || (*outermost)->location->folder != 0) return {};
  const std::string path = (*outermost)->location->name;
  if (!roots_.isThere(path)) return {};
  auto id = rootID(path);
  return id ? Result<void>() : fail(id.error());
}

Result<void> Learner::settleFoldersAbove(const Location& location) {
  auto folders = paths_.foldersAbove(location);
  if (!folders) return fail(folders.error());
  if (auto settled = settleRoot(*folders); !settled) return settled;
  for (const std::uint64_t id : *folders) {
    auto folder = store_.objectByFileID(id);
    if (!folder) return fail(folder.error());
    if (!*folder) return {};
    auto path = verify(**folder);
    if (path && !*path) path = search(std::move(**folder));
    if (!path) return fail(path.error());
    if (!*path) return {};
  }
  return {};
}

Result<void> Learner::learnAt(const Location& location) {
  if (auto settled = settleFoldersAbove(location); !settled) return settled;
  auto path = paths_.pathOf(location);
  if (!path) return fail(path.error());
  if (!*path) return {};
  const auto look = lookAt(roots_, **path);
  if (!look) return saysOutOfReach(look.error()) ? Result<void>() : fail(look.error());
  const std::string name = splitPath(**path).name;
  auto learned = learnPath(**path, look->seen.status, isPackageName_(name));
  if (!learned && !isDisturbance(learned.error())) return fail(learned.error());
  return {};
}

Result<std::optional<std::string>> Learner::search(ObjectRow row) {
  std::optional<std::string> hint;
  if (row.location) {
    auto path = paths_.pathOf(*row.location);
    if (!path) return fail(path.error());
    if (*path) hint = splitPath(**path).parent;
  }
  const auto answer =
      finder_.find(row, hint.value_or(roots_.firstPath()), [] { return std::vector<ObjectRow>(); });
  if (!answer) return fail(answer.error());
  const auto& found = *answer;
  if (!found) {
    if (!row.location) return std::nullopt;
    if (auto left = leave(std::move(row)); !left) return fail(left.error());
    return std::nullopt;
  }
  auto placed = placer_.placeFound(std::move(row), *found);
  if (!placed) return fail(placed.error());
  return verify(*placed);
}

Result<std::optional<std::string>> Learner::standingPath(std::uint64_t fileID) {
  auto row = store_.objectByFileID(fileID);
  if (!row) return fail(row.error());
  if (!*row) return std::nullopt;
  return verify(**row);
}

Result<std::optional<std::string>> Learner::find(std::uint64_t fileID) {
  finder_.forget();
  auto row = store_.objectByFileID(fileID);
  if (!row) return fail(row.error());
  if (!*row) return std::nullopt;
  auto path = verify(**row);
  if (!path || *path) return path;

  // What is at its place instead of it, in folders that may have moved themselves, may be its
  // successor.
  if ((*row)->location) {
    if (auto learned = learnAt(*(*row)->location); !learned) return fail(learned.error());
  }
  row = store_.objectByFileID(fileID);
  if (!row) return fail(row.error());
  if (!*row) return std::nullopt;
  path = verify(**row);
  if (!path || *path) return path;

  auto promoted = placer_.promoteLink(**row);
  if (!promoted) return fail(promoted.error());
  if (*promoted) path = verify(**row);
  if (!path || *path) return path;
  return search(std::move(**row));
}

Result<std::optional<std::uint64_t>> Learner::holderOf(std::uint32_t documentID) {
  auto waiting = store_.handoversOf(documentID);
  if (!waiting) return fail(waiting.error());
  for (const Location& location : *waiting) {
    if (auto learned = learnAt(location); !learned) return fail(learned.error());
  }
  auto holder = store_.objectByDocumentID(documentID);
  if (!holder) return fail(holder.error());
  if (!*holder) return std::nullopt;
  // Looking for the holder may find that another object has saved over it since.
  if (auto found = find((*holder)->fileID); !found) return fail(found.error());
  holder = store_.objectByDocumentID(documentID);
  if (!holder) return fail(holder.error());
  const bool isHeld = *holder && (*holder)->location && isDocumentKind((*holder)->kind);
  return isHeld ? std::optional((*holder)->fileID) : std::nullopt;
}

}  // namespace mirabel
