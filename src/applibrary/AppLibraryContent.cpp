#include "applibrary/AppLibraryContent.h"

#include <algorithm>
#include <utility>

#include "identity/MRBFileObjectIdentifier.h"

namespace mirabel {
namespace {

/// What leads elsewhere than its letters say can't be compared with other places.
bool isPlainPlace(const URL& url) {
  const auto components = url.pathComponents();
  const auto isDots = [](std::string_view component) {
    return component == "." || component == "..";
  };
  return !url.path().empty() && std::ranges::none_of(components, isDots);
}

/// Takes the last component off; false once there is none.
bool goUp(std::string_view& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string_view::npos || slash == 0) return false;
  path = path.substr(0, slash);
  return true;
}

bool isAtOrBelow(std::string_view path, std::string_view folder) {
  return path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/');
}

}  // namespace

URL documentFolderOf(const URL& dataContainer) {
  return dataContainer.appendingPathComponent("Documents");
}

bool makeTheSame(const BundleProxy& a, const BundleProxy& b) {
  return a.bundleIdentifier == b.bundleIdentifier && a.dataContainerURL == b.dataContainerURL &&
         a.localizedName == b.localizedName;
}

AppLibraryContent::AppLibraryContent(std::uint64_t token, const URL& documentStorage)
    : versionToken_(token), documentStorage_(documentStorage.properURL().path()) {}

bool AppLibraryContent::hasRoomFor(const BundleProxy& record) const {
  if (!record.dataContainerURL || !isPlainPlace(*record.dataContainerURL)) return false;
  const std::string path = documentFolderOf(*record.dataContainerURL).properURL().path();
  return !isClaimed(path) &&
         !appLibrariesByItemIDs_.contains(MRBFileObjectIdentifier::fromBundleProxy(record));
}

bool AppLibraryContent::isClaimed(const std::string& path) const {
  if (isAtOrBelow(path, documentStorage_) || isAtOrBelow(documentStorage_, path)) return true;
  std::string_view above = path;
  do {
    if (bundleProxiesByRootURLs_.contains(above)) return true;
  } while (goUp(above));
  const auto below = bundleProxiesByRootURLs_.lower_bound(path + "/");
  return below != bundleProxiesByRootURLs_.end() && below->first.starts_with(path + "/");
}

void AppLibraryContent::add(Library library) {
  const std::size_t place = libraries_.size();
  appLibrariesByItemIDs_.emplace(library.item->itemIdentifier(), place);
  bundleProxiesByRootURLs_.emplace(library.item->fileURL().properURL().path(), place);
  libraries_.push_back(std::move(library));
}

void AppLibraryContent::finish(std::vector<BundleProxy> allRecords) {
  records_ = std::move(allRecords);
  auto roots = std::make_shared<std::vector<URL>>();
  roots->reserve(libraries_.size());
  for (const Library& library : libraries_)
    roots->push_back(library.item->fileURL().properURL());
  rootURLs_ = std::move(roots);
}

const AppLibraryContent::Library* AppLibraryContent::at(const Places& places,
                                                        std::string_view key) const {
  const auto found = places.find(key);
  return found == places.end() ? nullptr : &libraries_[found->second];
}

const AppLibraryContent::Library* AppLibraryContent::withItemIdentifier(
    std::string_view identifier) const {
  return at(appLibrariesByItemIDs_, identifier);
}

const AppLibraryContent::Library* AppLibraryContent::atRootURL(const URL& url) const {
  return at(bundleProxiesByRootURLs_, url.properURL().path());
}

const AppLibraryContent::Library* AppLibraryContent::owning(const URL& url) const {
  if (!isPlainPlace(url)) return nullptr;
  const URL canonical = url.properURL();
  std::string_view folder = canonical.path();
  while (goUp(folder))
    if (const Library* library = at(bundleProxiesByRootURLs_, folder)) return library;
  return nullptr;
}

}  // namespace mirabel
