#include "linux/operations/ItemMove.h"

#include <cerrno>

#include "linux/operations/CrossMove.h"

namespace mirabel {
namespace {

// So many names are tried one after the other; then their number is searched for.
constexpr std::uint64_t mostTriedInOrder = 32;
constexpr int mostSearches = 16;

bool isSameObject(const ObjectStatus& a, const ObjectStatus& b) {
  return a.inode == b.inode && a.device == b.device;
}

}  // namespace

Result<URL> ItemMove::rename(const URL& item, const std::string& newName) const {
  if (auto refusal = whyNoName(newName)) return fail(*std::move(refusal));
  auto place = itemPlaceOf(context_, item);
  if (!place) return fail(place.error());
  const int folder = place->folder.descriptor.get();
  const auto status = context_.calls.status(folder, place->name);
  if (!status) return fail(status.error());
  URL renamed = place->folder.url(newName);
  if (newName == place->name) return renamed;
  auto done = renameWithin(context_, folder, place->name, newName);
  if (!done && done.error().isPosix(EEXIST)) {
    // In a folder that takes both spellings for one name, the item itself is in its way. Another
    // name of the same file is a name that is taken.
    const auto taken = context_.calls.status(folder, newName);
    const bool isItself = taken && isSameObject(*taken, *status) &&
                          (status->kind == FileKind::folder || status->linkCount == 1);
    if (isItself) return respell(*place, newName);
  }
  if (!done) return fail(operationError(done.error(), renamed));
  if (auto synced = syncFolder(context_, folder); !synced) return fail(synced.error());
  return renamed;
}

/// By way of a hidden name, since the new spelling is free only when the old one is gone.
Result<URL> ItemMove::respell(const ItemPlace& item, const std::string& newName) const {
  const int folder = item.folder.descriptor.get();
  auto noted = context_.pending.folderAt(item.folder.path);
  if (!noted) return fail(noted.error());
  const PendingRename record{*std::move(noted), item.name, context_.pending.hiddenName(), newName};
  if (auto begun = context_.pending.begin(record); !begun) return fail(begun.error());
  auto done = renameWithin(context_, folder, item.name, record.hidden);
  if (done) {
    done = context_.calls.rename(folder, record.hidden, folder, newName);
    // Where that fails too, the next start does it.
    if (!done && !context_.calls.rename(folder, record.hidden, folder, item.name)) {
      return fail(operationError(done.error(), item.folder.url(newName)));
    }
  }
  auto synced = syncFolder(context_, folder);
  context_.pending.end(record);
  if (!done) return fail(operationError(done.error(), item.folder.url(newName)));
  if (!synced) return fail(synced.error());
  return item.folder.url(newName);
}

Result<URL> ItemMove::moveUnder(const URL& item, const URL& folder,
                                const std::optional<std::string>& newName,
                                Bouncing bouncing) const {
  if (newName) {
    if (auto refusal = whyNoName(*newName)) return fail(*std::move(refusal));
  }
  auto place = itemPlaceOf(context_, item);
  if (!place) return fail(place.error());
  auto target = openFolder(context_, folder);
  if (!target) return fail(target.error());
  const auto status = context_.calls.status(place->folder.descriptor.get(), place->name);
  if (!status) return fail(status.error());
  std::string name = newName.value_or(place->name);
  const auto from = context_.calls.status(place->folder.descriptor.get());
  const auto to = context_.calls.status(target->descriptor.get());
  if (!from || !to) return fail(from ? to.error() : from.error());
  if (isSameObject(*from, *to)) {
    if (name == place->name) return target->url(name);
    auto renamed = rename(item, name);
    if (renamed || bouncing == Bouncing::refused || !renamed.error().is(FileErrorCode::fileExists))
      return renamed;
  }
  auto moved = renameTo(*place, *target, name);
  if (!moved && moved.error().isPosix(EEXIST) && bouncing == Bouncing::allowed) {
    auto bounced = bounce(*place, *target, name, kindOfName(context_, *status, name));
    moved = bounced ? Result<void>() : fail(bounced.error());
    if (bounced) name = *std::move(bounced);
  }
  URL url = target->url(name);
  if (!moved) return fail(operationError(moved.error(), url));
  // First where it is, then where it is no more: after a loss of power it may be in both places,
  // but it is in one of them.
  if (auto synced = syncFolder(context_, target->descriptor.get()); !synced)
    return fail(synced.error());
  if (auto synced = syncFolder(context_, place->folder.descriptor.get()); !synced)
    return fail(synced.error());
  return url;
}

Result<void> ItemMove::renameTo(const ItemPlace& item, const OpenFolder& folder,
                                const std::string& name) const {
  const int from = item.folder.descriptor.get();
  auto renamed = context_.calls.rename(from, item.name, folder.descriptor.get(), name);
  if (renamed) return renamed;
  const bool isOther = renamed.error().isPosix(EXDEV);
  // Not to be copied into itself either.
  if (isOther || renamed.error().isPosix(EINVAL)) {
    const auto status = context_.calls.status(from, item.name);
    if (!status) return fail(status.error());
    if (status->kind == FileKind::folder) {
      const auto within = liesWithin(context_, folder.descriptor.get(), *status);
      if (!within) return fail(within.error());
      if (*within) return fail(Error::posix(EINVAL, "a folder can't be moved into itself"));
    }
  }
  return isOther ? CrossMove(context_).run(item, folder, name) : renamed;
}

Result<std::string> ItemMove::bounce(const ItemPlace& item, const OpenFolder& folder,
                                     const std::string& wanted, NameOf kind) const {
  std::uint64_t number = 2;
  for (int search = 0;; ++search) {
    std::string name = numberedName(wanted, number, kind);
    auto moved = renameTo(item, folder, name);
    if (moved) return name;
    if (!moved.error().isPosix(EEXIST)) return fail(moved.error());
    if (search == mostSearches + static_cast<int>(mostTriedInOrder)) return fail(moved.error());
    ++number;
    if (number > mostTriedInOrder) number = firstFreeNumber(folder, wanted, number, kind);
  }
}

/// A number whose name was free, and the one before it not, as far as looking can tell. Where
/// thousands of one name are in a trash, trying each would take longer with every further one.
std::uint64_t ItemMove::firstFreeNumber(const OpenFolder& folder, const std::string& wanted,
                                        std::uint64_t from, NameOf kind) const {
  const auto isTaken = [&](std::uint64_t number) {
    return context_.calls.status(folder.descriptor.get(), numberedName(wanted, number, kind))
        .has_value();
  };
  std::uint64_t taken = from - 1;
  std::uint64_t free = from;
  while (isTaken(free)) {
    taken = free;
    free *= 2;
  }
  while (free - taken > 1) {
    const std::uint64_t middle = taken + (free - taken) / 2;
    (isTaken(middle) ? taken : free) = middle;
  }
  return free;
}

}  // namespace mirabel
