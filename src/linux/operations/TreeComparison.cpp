#include "linux/operations/TreeComparison.h"

#include <algorithm>
#include <fcntl.h>
#include <vector>

#include "linux/kernel/AttributeCalls.h"

namespace mirabel {
namespace {

/// Some file systems keep times to 100 nanoseconds, 10 milliseconds or whole seconds only.
bool isSameTime(std::int64_t time, std::int64_t copied) {
  constexpr std::int64_t steps[] = {
      1, 100, 1000, 10'000'000, nanosecondsPerSecond, 2 * nanosecondsPerSecond};
  return std::ranges::any_of(steps, [&](std::int64_t step) {
    return copied % step == 0 && time >= copied && time - copied < step;
  });
}

Result<FileCalls::Attributes> userAttributesAt(const FileCalls& calls, int folder,
                                               const std::string& name) {
  auto opened = calls.open(folder, name, O_PATH);
  if (!opened) return fail(opened.error());
  auto attributes = calls.attributes(opened->get());
  if (!attributes) return attributes;
  std::erase_if(*attributes, [](const auto& attribute) {
    return !attribute.first.starts_with(userAttributePrefix);
  });
  return attributes;
}

class Comparison {
 public:
  explicit Comparison(const FileCalls& calls) : calls_(calls) {}

  /// What is a folder in both is noted under `path`, to be compared in turn.
  Result<bool> compare(int folder, const std::string& name, int otherFolder,
                       const std::string& otherName, const std::string& path) {
    const auto a = calls_.status(folder, name);
    const auto b = calls_.status(otherFolder, otherName);
    if (!a || !b) return fail(a ? b.error() : a.error());
    if (a->kind != b->kind) return false;
    if (a->kind == FileKind::regular) {
      if (a->size != b->size || !isSameTime(a->modificationTime, b->modificationTime)) return false;
    }
    if (a->kind == FileKind::folder) folders_.push_back(path);
    if (a->kind != FileKind::symbolicLink)
      return sameAttributes(folder, name, otherFolder, otherName);
    const auto target = calls_.target(folder, name);
    const auto otherTarget = calls_.target(otherFolder, otherName);
    if (!target || !otherTarget) return fail(target ? otherTarget.error() : target.error());
    return *target == *otherTarget;
  }

  Result<bool> compareFolders(int top, int otherTop) {
    for (std::size_t i = 0; i < folders_.size(); ++i) {
      const std::string path = folders_[i];
      auto folder = open(top, path);
      auto otherFolder = open(otherTop, path);
      if (!folder || !otherFolder) return fail(folder ? otherFolder.error() : folder.error());
      auto alike = compareEntries(folder->get(), otherFolder->get(), path);
      if (!alike || !*alike) return alike;
    }
    return true;
  }

 private:
  Result<bool> sameAttributes(int folder, const std::string& name, int otherFolder,
                              const std::string& otherName) const {
    auto ours = userAttributesAt(calls_, folder, name);
    auto others = userAttributesAt(calls_, otherFolder, otherName);
    if (!ours || !others) return fail(ours ? others.error() : ours.error());
    std::ranges::sort(*ours);
    std::ranges::sort(*others);
    return *ours == *others;
  }

  [[nodiscard]] Result<UniqueFd> open(int top, const std::string& path) const {
    return calls_.openBelow(top, path, O_PATH | O_DIRECTORY, FileCalls::Mounts::refused);
  }

  Result<bool> compareEntries(int folder, int otherFolder, const std::string& path) {
    auto names = sortedNames(folder);
    auto otherNames = sortedNames(otherFolder);
    if (!names || !otherNames) return fail(names ? otherNames.error() : names.error());
    if (*names != *otherNames) return false;
    for (const std::string& name : *names) {
      auto alike = compare(folder, name, otherFolder, name, pathBelow(path, name));
      if (!alike || !*alike) return alike;
    }
    return true;
  }

  [[nodiscard]] Result<std::vector<std::string>> sortedNames(int folder) const {
    auto entries = entriesOf(calls_, folder);
    if (!entries) return fail(entries.error());
    std::vector<std::string> names;
    for (FolderEntry& entry : *entries)
      names.push_back(std::move(entry.name));
    std::ranges::sort(names);
    return names;
  }

  const FileCalls& calls_;
  std::vector<std::string> folders_;
};

}  // namespace

Result<bool> looksAlike(const FileCalls& calls, int folder, const std::string& name,
                        int otherFolder, const std::string& otherName) {
  Comparison comparison(calls);
  auto alike = comparison.compare(folder, name, otherFolder, otherName, {});
  if (!alike || !*alike) return alike;
  const auto status = calls.status(folder, name);
  if (!status) return fail(status.error());
  if (status->kind != FileKind::folder) return true;
  constexpr int flags = O_PATH | O_DIRECTORY;
  auto top = calls.openBelow(folder, name, flags, FileCalls::Mounts::refused);
  auto otherTop = calls.openBelow(otherFolder, otherName, flags, FileCalls::Mounts::refused);
  if (!top || !otherTop) return fail(top ? otherTop.error() : top.error());
  return comparison.compareFolders(top->get(), otherTop->get());
}

}  // namespace mirabel
