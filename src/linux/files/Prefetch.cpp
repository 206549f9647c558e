#include "linux/files/Prefetch.h"

#include <algorithm>
#include <cerrno>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>
#include <unordered_map>
#include <vector>

#include "foundation/SplitWork.h"
#include "foundation/URL.h"
#include "linux/files/LinuxExtendedAttributes.h"
#include "linux/files/PackageTypes.h"
#include "linux/kernel/AttributeCalls.h"

namespace mirabel {
namespace {

// Below this many entries a second thread costs more than it brings.
constexpr std::size_t fewestToSplit = 64;
constexpr std::size_t pieceSize = 32;

// The folder that some of the URLs lie in, held open.
struct Folder {
  std::string_view path;
  UniqueFd descriptor;
  ObjectStatus status;
  bool isReadOnly = false;
  std::vector<const URL*> entries;
};

// What goes with a sighting; the sightings lie in a row of their own for the index.
struct Look {
  const URL* url = nullptr;
  bool isThere = false;
  std::int64_t changeTime = 0;
  bool isWritable = false;
  bool hasAttributeNames = false;
  std::vector<std::string> attributeNames;
};

bool isEntryBelowRoot(const MonitoredRoots& roots, const URL& url) {
  if (!url.isFileURL()) return false;
  const std::string_view name = url.lastPathComponent();
  if (name == "." || name == "..") return false;
  const auto place = roots.locate(url.path());
  return place && !place->relative.empty();
}

std::string_view folderPathOf(const URL& url) {
  const std::string_view path = url.path();
  return path.substr(0, path.size() - url.lastPathComponent().size() - 1);
}

std::vector<Folder> groupByFolder(const MonitoredRoots& roots, std::span<const URL> urls,
                                  std::vector<const URL*>& others) {
  std::vector<Folder> folders;
  std::unordered_map<std::string_view, std::size_t> indexOfPath;
  for (const URL& url : urls) {
    if (!isEntryBelowRoot(roots, url)) {
      others.push_back(&url);
      continue;
    }
    const std::string_view path = folderPathOf(url);
    if (folders.empty() || folders.back().path != path) {
      const auto [found, isNew] = indexOfPath.emplace(path, folders.size());
      if (isNew)
        folders.push_back(Folder{.path = path, .descriptor = {}, .status = {}, .entries = {}});
      folders[found->second].entries.push_back(&url);
      continue;
    }
    folders.back().entries.push_back(&url);
  }
  return folders;
}

bool openFolder(const MonitoredRoots& roots, Folder& folder) {
  auto opened = roots.openHolder(std::string(folder.path));
  if (!opened) return false;
  folder.descriptor = std::move(*opened);
  const auto status = statusAt(folder.descriptor.get(), "");
  struct statvfs fileSystem;
  if (!status || ::fstatvfs(folder.descriptor.get(), &fileSystem) != 0) return false;
  folder.status = *status;
  folder.isReadOnly = (fileSystem.f_flag & ST_RDONLY) != 0;
  return true;
}

// It moved, or something came in its way, since it was opened: its entries are looked at one by
// one, and each tells.
bool concernsThisFolder(const Error& error) {
  constexpr int codes[] = {ENOENT, ENOTDIR, ELOOP, EXDEV, ESTALE, EACCES};
  return std::ranges::any_of(codes, [&](int code) { return error.isPosix(code); });
}

// The owner's permission bit decides alone in the usual case, which saves a system call.
bool isWritable(const Folder& folder, const Sighting& sighting, uid_t user) {
  constexpr std::uint64_t fixed = STATX_ATTR_IMMUTABLE | STATX_ATTR_APPEND;
  const ObjectStatus& status = sighting.status;
  if (!folder.isReadOnly && status.device == folder.status.device && status.owner == user &&
      (status.mode & S_IWUSR) != 0 && (status.attributes & fixed) == 0) {
    return true;
  }
  return mayWrite(folder.descriptor.get(), sighting.name);
}

class FolderPrefetch {
 public:
  FolderPrefetch(const LookContext& context, Folder& folder)
      : context_(context),
        folder_(folder),
        sightings_(folder.entries.size()),
        looks_(folder.entries.size()) {}

  Result<void> run() {
    const std::size_t count = looks_.size();
    const auto look = [this](std::size_t begin, std::size_t end) { lookAtEach(begin, end); };
    if (count < fewestToSplit) {
      look(0, count);
    } else {
      splitWork(count, pieceSize, look);
    }
    dropMissing();
    auto learned =
        context_.index.learn(std::string(folder_.path), folder_.descriptor.get(), sightings_);
    if (!learned && concernsThisFolder(learned.error())) return {};
    if (!learned) return fail(learned.error());
    fillCaches();
    fillFolder(*learned);
    return {};
  }

 private:
  void lookAtEach(std::size_t begin, std::size_t end) {
    std::vector<char> buffer;
    const uid_t user = ::geteuid();
    for (std::size_t i = begin; i < end; ++i) {
      lookAtOne(*folder_.entries[i], sightings_[i], looks_[i], buffer, user);
    }
  }

  void lookAtOne(const URL& url, Sighting& sighting, Look& look, std::vector<char>& buffer,
                 uid_t user) const {
    look.url = &url;
    sighting.name = url.lastPathComponent();
    const int folder = folder_.descriptor.get();
    auto status = statusAt(folder, sighting.name);
    if (!status) return;
    look.isThere = true;
    look.changeTime = status->changeTime;
    sighting.status = *status;
    sighting.isPackage =
        status->kind == FileKind::folder && PackageTypes::isPackageName(sighting.name);
    look.isWritable = isWritable(folder_, sighting, user);
    const auto list = listAttributes(folder, sighting.name, buffer);
    look.hasAttributeNames = list.has_value();
    if (list && !list->empty()) look.attributeNames = userAttributeNames(*list);
  }

  // The index takes the sightings in one row, so the gaps are closed in both.
  void dropMissing() {
    std::size_t kept = 0;
    for (std::size_t i = 0; i < looks_.size(); ++i) {
      if (!looks_[i].isThere) continue;
      if (kept != i) {
        looks_[kept] = std::move(looks_[i]);
        sightings_[kept] = std::move(sightings_[i]);
      }
      ++kept;
    }
    looks_.resize(kept);
    sightings_.resize(kept);
  }

  void fillCaches() {
    const KeptAttributes& kept = context_.index.keptAttributes();
    for (std::size_t i = 0; i < looks_.size(); ++i) {
      ResourceCache& cache = looks_[i].url->resources();
      const Sighting& sighting = sightings_[i];
      // Gone or changed meanwhile: the next read of it looks again.
      if (sighting.fileID == 0 || sighting.status.changeTime != looks_[i].changeTime) continue;
      cache.fill(valuesOf(context_.types, sighting.name, sighting, looks_[i].isWritable));
      if (!kept.isEmpty()) mergeNames(looks_[i].attributeNames, kept.of(sighting.fileID));
      if (looks_[i].hasAttributeNames) {
        cache.setAttributeNames(std::move(looks_[i].attributeNames));
      }
    }
  }

  // Items name the folder that they lie in. It was looked at when it was opened, and the index has
  // said which it is.
  void fillFolder(std::uint64_t fileID) {
    const URL url = folder_.entries.front()->deletingLastPathComponent();
    const std::string_view name = url.lastPathComponent();
    // A package is a document as well, and a root has a way of its own.
    if (url.resources().isFilled() || PackageTypes::isPackageName(name)) return;
    if (!isEntryBelowRoot(context_.roots, url)) return;
    const Sighting sighting{"", folder_.status, false, fileID};
    url.resources().fill(
        valuesOf(context_.types, name, sighting, isWritable(folder_, sighting, ::geteuid())));
  }

  const LookContext& context_;
  Folder& folder_;
  std::vector<Sighting> sightings_;
  std::vector<Look> looks_;
};

}  // namespace

Result<void> prefetchAll(const LookContext& context, std::span<const URL> urls) {
  std::vector<const URL*> others;
  for (Folder& folder : groupByFolder(context.roots, urls, others)) {
    if (!openFolder(context.roots, folder)) continue;
    auto done = FolderPrefetch(context, folder).run();
    if (!done) return done;
    folder.descriptor.reset();
  }
  if (others.size() > 1) {
    std::vector<std::string> paths;
    paths.reserve(others.size());
    for (const URL* url : others)
      if (url->isFileURL()) paths.push_back(url->path());
    if (auto learned = context.index.learnPaths(paths); !learned) return learned;
  }
  for (const URL* url : others) {
    auto values = lookAtObject(context, *url);
    if (!values && values.error().domain == ErrorDomain::store) return fail(values.error());
    if (values) url->resources().fill(std::move(*values));
  }
  return {};
}

}  // namespace mirabel
