#include "fs/FSDirectoryWalk.h"

#include <string>
#include <string_view>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

void logFailure(std::string_view step, const URL& directory, const Error& error) {
  logDebug([&] {
    return "can't " + std::string(step) + " directory at " + directory.path() + "; " +
           error.description();
  });
}

bool isComponent(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && !name.contains('/');
}

}  // namespace

FSDirectoryWalk::FSDirectoryWalk(Plan plan, DirectoryStreams& directories,
                                 ResourceValueSource& resources)
    : plan_(std::move(plan)), directories_(directories), reader_(resources) {}

Result<std::uint64_t> FSDirectoryWalk::next(std::uint64_t limit, const Visitor& visitor) {
  std::uint64_t count = 0;
  while (count < limit) {
    const auto entry = nextEntry();
    if (!entry) return fail(entry.error());
    if (!*entry) break;
    ++count;
    if (auto visited = visitor(**entry); !visited) return fail(visited.error());
  }
  return count;
}

Result<void> FSDirectoryWalk::finish() {
  descent_.reset();
  for (;;) {
    bool outermostHasMore = false;
    while (!levels_.empty()) {
      outermostHasMore = readVisible().has_value();
      if (auto left = leave(); !left) return left;
    }
    if (outermostHasMore || nextRoot_ == plan_.urls.size()) return {};
    if (auto entered = enter(plan_.urls[nextRoot_++]); !entered) return entered;
  }
}

void FSDirectoryWalk::pause() {
  for (Level& level : levels_)
    level.fileID = fileIDAt(level.url);
}

bool FSDirectoryWalk::resume() {
  for (std::size_t i = 0; i < levels_.size(); ++i) {
    URL& url = levels_[i].url;
    // Each level was entered from the one before: their URLs stay parent and child.
    url = i == 0 ? URL::fileURL(url.path())
                 : levels_[i - 1].url.appendingPathComponent(url.lastPathComponent());
    const auto fileID = fileIDAt(url);
    if (!fileID || fileID != levels_[i].fileID) return false;
  }
  if (!descent_) return true;
  descent_->url = levels_.back().url.appendingPathComponent(descent_->url.lastPathComponent());
  return true;
}

std::optional<WalkPosition> FSDirectoryWalk::position() {
  WalkPosition at{planDigest(), nextRoot_, {}, {}};
  for (const Level& level : levels_) {
    const Number* fileID = level.fileID ? std::get_if<Number>(&*level.fileID) : nullptr;
    const auto known = fileID == nullptr ? std::nullopt : fileID->asUnsigned();
    const auto position = level.stream->position();
    if (!known || !position) return {};
    const std::string_view name =
        at.folders.empty() ? level.url.path() : level.url.lastPathComponent();
    at.folders.push_back({std::string(name), *known, *position});
  }
  if (descent_) at.descent = descent_->url.lastPathComponent();
  return at;
}

Result<bool> FSDirectoryWalk::restore(const WalkPosition& position) {
  if (position.plan != planDigest() || position.nextRoot > plan_.urls.size()) return false;
  if (position.nextRoot == 0 && !position.folders.empty()) return false;
  if (position.descent && (position.folders.empty() || !isComponent(*position.descent))) {
    return false;
  }
  nextRoot_ = position.nextRoot;
  for (const WalkPosition::Folder& folder : position.folders) {
    const bool isRoot = levels_.empty();
    if (!isRoot && !isComponent(folder.name)) return false;
    URL url =
        isRoot ? plan_.urls[nextRoot_ - 1] : levels_.back().url.appendingPathComponent(folder.name);
    if (isRoot && url.path() != folder.name) return false;
    auto restored = restoreLevel(folder, std::move(url));
    if (!restored || !*restored) return restored;
  }
  if (!position.descent) return true;
  const Level& level = levels_.back();
  descent_ = Descent{level.url.appendingPathComponent(*position.descent), level.options};
  return true;
}

/// False when another object lies there, or none that can be reached.
Result<bool> FSDirectoryWalk::restoreLevel(const WalkPosition::Folder& folder, URL url) {
  auto fileID = reader_.value(ResourceKey::fileIdentifier, url);
  if (!fileID && plan_.leavesOut && !plan_.leavesOut(url, fileID.error())) {
    return fail(fileID.error());
  }
  if (!fileID || *fileID != ResourceValue(Number::of(folder.fileID))) return false;
  auto stream = directories_.openAt(url, folder.position);
  if (!stream) {
    logFailure("open", url, stream.error());
    if (plan_.leavesOut && plan_.leavesOut(url, stream.error())) return false;
    return fail(stream.error());
  }
  const EnumeratorOptions options = optionsFor(url);
  levels_.push_back({std::move(url), *std::move(stream), options, *std::move(fileID)});
  return true;
}

/// FNV-1a over the paths, each with a byte behind it that no path has.
std::uint64_t FSDirectoryWalk::planDigest() const {
  std::uint64_t digest = 0xCBF29CE484222325;
  const auto add = [&](char byte) {
    digest = (digest ^ static_cast<unsigned char>(byte)) * 0x100000001B3;
  };
  for (const URL& url : plan_.urls) {
    for (const char byte : url.path())
      add(byte);
    add('\0');
  }
  return digest;
}

/// The next entry that counts; nothing at the end of the walk.
Result<std::optional<URL>> FSDirectoryWalk::nextEntry() {
  for (;;) {
    if (const auto descent = std::exchange(descent_, {})) {
      if (auto descended = descend(*descent); !descended) return fail(descended.error());
    }
    if (levels_.empty()) {
      if (nextRoot_ == plan_.urls.size()) return std::nullopt;
      if (auto entered = enter(plan_.urls[nextRoot_++]); !entered) return fail(entered.error());
      continue;
    }
    if (const auto entry = readVisible()) {
      const Level& level = levels_.back();
      URL child = level.url.appendingPathComponent(entry->name);
      if (entry->kind == FileKind::folder) descent_ = Descent{child, level.options};
      return child;
    }
    if (auto left = leave(); !left) return fail(left.error());
  }
}

/// The next entry of the innermost directory that its options do not leave out.
std::optional<DirectoryEntry> FSDirectoryWalk::readVisible() {
  const Level& level = levels_.back();
  const bool skipsHidden = level.options.contains(EnumeratorOptions::skipsHiddenFiles);
  while (const auto entry = level.stream->next()) {
    if (entry->name == "." || entry->name == "..") continue;
    if (!skipsHidden || !entry->name.starts_with('.')) return entry;
  }
  return {};
}

Result<void> FSDirectoryWalk::enter(const URL& directory) {
  const EnumeratorOptions options = optionsFor(directory);
  auto stream = directories_.open(directory);
  if (stream) {
    levels_.push_back({directory, *std::move(stream), options});
    return {};
  }
  logFailure("open", directory, stream.error());
  if (plan_.leavesOut && plan_.leavesOut(directory, stream.error())) return {};
  return fail(stream.error());
}

Result<void> FSDirectoryWalk::leave() {
  const Level level = std::move(levels_.back());
  levels_.pop_back();
  auto closed = level.stream->close();
  if (!closed) logFailure("close", level.url, closed.error());
  return closed;
}

EnumeratorOptions FSDirectoryWalk::optionsFor(const URL& directory) const {
  using Options = EnumeratorOptions;
  if (plan_.directoryEnumerationOptionsFor) {
    if (const auto options = plan_.directoryEnumerationOptionsFor(directory)) return *options;
  }
  constexpr Options visible{Options::skipsHiddenFiles, Options::skipsPackageDescendants};
  return plan_.recursively ? visible : visible.unionWith(Options::skipsSubdirectoryDescendants);
}

/// Enters the folder if the options of the one that holds it say so.
Result<void> FSDirectoryWalk::descend(const Descent& descent) {
  using Options = EnumeratorOptions;
  constexpr Options nothing{Options::skipsPackageDescendants,
                            Options::skipsSubdirectoryDescendants};
  if (descent.options.contains(nothing)) return {};
  const auto value = reader_.value(ResourceKey::isPackage, descent.url);
  if (!value && plan_.leavesOut && !plan_.leavesOut(descent.url, value.error())) {
    return fail(value.error());
  }
  const bool* isPackage = value ? std::get_if<bool>(&*value) : nullptr;
  if (isPackage == nullptr) return {};
  const Options skips =
      *isPackage ? Options::skipsPackageDescendants : Options::skipsSubdirectoryDescendants;
  return descent.options.contains(skips) ? Result<void>{} : enter(descent.url);
}

std::optional<ResourceValue> FSDirectoryWalk::fileIDAt(const URL& directory) const {
  auto value = reader_.value(ResourceKey::fileIdentifier, directory);
  if (!value) return {};
  return *std::move(value);
}

}  // namespace mirabel
