#include "support/FakeFileOperations.h"

#include <algorithm>
#include <cerrno>
#include <utility>

namespace mirabel::testing {
namespace {

constexpr std::size_t longestName = 255;

Result<void> checkName(std::string_view name) {
  constexpr std::string_view separators("/\0", 2);
  const bool isNone = name.empty() || name == "." || name == "..";
  if (isNone || name.find_first_of(separators) != name.npos) return fail(Error::posix(EINVAL));
  if (name.size() > longestName) return fail(Error::posix(ENAMETOOLONG));
  return {};
}

bool isAtOrBelow(const URL& place, const URL& folder) {
  return place == folder || place.path().starts_with(folder.path() + "/");
}

URL placeIn(const URL& folder, std::string_view name) {
  return URL::fileURL(folder.path() + "/" + std::string(name));
}

}  // namespace

Result<void> FakeFileOperations::createDirectory(const URL& url) {
  const std::lock_guard lock(core_.mutex);
  const auto existing = core_.look(Op::createDirectory, url);
  if (existing && (*existing)->kind != FileKind::folder) return fail(Error::posix(EEXIST));
  if (!existing && !existing.error().isPosix(ENOENT)) return fail(existing.error());
  core_.volume.makeFolder(url.path());
  return {};
}

void FakeFileOperations::vs_importUnderFolder(const URL& source, const URL& folder,
                                              URLHandler completionHandler) {
  report(imported(source, folder), std::move(completionHandler));
}

void FakeFileOperations::vs_createSubFolder(const URL& folder, std::string_view name,
                                            URLHandler completionHandler) {
  report(created(folder, name), std::move(completionHandler));
}

void FakeFileOperations::vs_renameWithNewName(const URL& item, std::string_view newName,
                                              URLHandler completionHandler) {
  report(moved(Op::renameWithNewName, item, item.deletingLastPathComponent(), newName,
               Bouncing::refused),
         std::move(completionHandler));
}

void FakeFileOperations::vs_reparentUnderFolder(const URL& item, const URL& folder,
                                                std::optional<std::string> newName,
                                                Bouncing allowBouncing,
                                                URLHandler completionHandler) {
  const std::string name = newName.value_or(std::string(item.lastPathComponent()));
  report(moved(Op::reparentUnderFolder, item, folder, name, allowBouncing),
         std::move(completionHandler));
}

void FakeFileOperations::vs_trashUnderFolder(const URL& item, const URL& folder,
                                             URLHandler completionHandler) {
  report(moved(Op::trashUnderFolder, item, folder, item.lastPathComponent(), Bouncing::allowed),
         std::move(completionHandler));
}

void FakeFileOperations::vs_deleteWithCompletionHandler(const URL& item,
                                                        ErrorHandler completionHandler) {
  reports_.make([completionHandler = std::move(completionHandler), outcome = deleted(item)] {
    completionHandler(outcome);
  });
}

std::optional<Error> FakeFileOperations::vs_withReadWriteAccess(const URL& url,
                                                                const AccessBlock& block) {
  std::unique_lock lock(core_.mutex);
  const auto node = core_.look(Op::readWriteAccess, url);
  lock.unlock();
  if (!node) return node.error();
  FakeAttributeTarget target(core_, *node);
  return block(target);
}

void FakeFileOperations::report(Result<URL> outcome, URLHandler completionHandler) {
  if (outcome) outcome = reports_.outcome.value_or(*outcome);
  reports_.make([completionHandler = std::move(completionHandler), outcome = std::move(outcome)] {
    completionHandler(outcome);
  });
}

Result<URL> FakeFileOperations::imported(const URL& source, const URL& folder) {
  const std::lock_guard lock(core_.mutex);
  const auto node = core_.look(Op::importUnderFolder, source);
  if (!node) return fail(node.error());
  if (const auto name = checkName(source.lastPathComponent()); !name) return fail(name.error());
  if (const auto there = checkFolder(folder); !there) return fail(there.error());
  const URL place = placeIn(folder, source.lastPathComponent());
  if (!isFree(place)) return fail(fileExists(place));
  core_.volume.copy(source.path(), place.path());
  return place;
}

Result<URL> FakeFileOperations::created(const URL& folder, std::string_view name) {
  const std::lock_guard lock(core_.mutex);
  if (auto error = core_.faults.hit(Op::createSubFolder)) return fail(*std::move(error));
  if (const auto checked = checkName(name); !checked) return fail(checked.error());
  if (const auto there = checkFolder(folder); !there) return fail(there.error());
  const URL place = placeIn(folder, name);
  if (!isFree(place)) return fail(fileExists(place));
  core_.volume.makeFolder(place.path());
  return place;
}

Result<URL> FakeFileOperations::moved(Op op, const URL& item, const URL& folder,
                                      std::string_view name, Bouncing bouncing) {
  const std::lock_guard lock(core_.mutex);
  const auto node = core_.look(op, item);
  if (!node) return fail(node.error());
  if (const auto checked = checkName(name); !checked) return fail(checked.error());
  if (const auto there = checkFolder(folder); !there) return fail(there.error());
  if (isAtOrBelow(folder, item)) return fail(Error::posix(EINVAL));
  const URL wanted = placeIn(folder, name);
  if (wanted == item) return wanted;
  if (!isFree(wanted) && bouncing == Bouncing::refused) return fail(fileExists(wanted));
  const URL place = freePlace(folder, name);
  core_.volume.rename(item.path(), place.path());
  return place;
}

std::optional<Error> FakeFileOperations::deleted(const URL& item) {
  const std::lock_guard lock(core_.mutex);
  const auto node = core_.look(Op::deleteItem, item);
  if (!node) return node.error();
  core_.volume.remove(item.path());
  return {};
}

Result<void> FakeFileOperations::checkFolder(const URL& folder) const {
  const auto node = core_.volume.find(folder.path());
  if (!node) return fail(node.error());
  if ((*node)->kind != FileKind::folder) return fail(Error::posix(ENOTDIR));
  return {};
}

bool FakeFileOperations::isFree(const URL& place) const {
  return !core_.volume.find(place.path());
}

URL FakeFileOperations::freePlace(const URL& folder, std::string_view name) const {
  const std::size_t dot = name.rfind('.');
  const bool hasExtension = dot != name.npos && dot > 0;
  const std::string_view extension = hasExtension ? name.substr(dot) : std::string_view();
  const std::string_view stem = name.substr(0, name.size() - extension.size());
  URL place = placeIn(folder, name);
  for (int number = 2; !isFree(place); ++number) {
    const std::string ending = " " + std::to_string(number) + std::string(extension);
    std::string bounced(stem.substr(0, longestName - std::min(longestName, ending.size())));
    place = placeIn(folder, bounced + ending);
  }
  return place;
}

}  // namespace mirabel::testing
