#include "enumeration/GatherPage.h"

#include <utility>

#include "foundation/Log.h"
#include "foundation/LookFailure.h"
#include "foundation/SplitWork.h"
#include "platform/VesselManager.h"

namespace mirabel {
namespace {

constexpr std::string_view trashName = ".Trash";
// Handing work to another thread costs as much as a few items.
constexpr std::size_t pieceSize = 32;

/// One level, without hidden names, for the trash; the default for every other folder.
std::optional<EnumeratorOptions> optionsFor(const URL& folder) {
  using Options = EnumeratorOptions;
  if (folder.lastPathComponent() != trashName) return {};
  return Options{Options::skipsHiddenFiles, Options::skipsPackageDescendants,
                 Options::skipsSubdirectoryDescendants};
}

}  // namespace

bool GatherScope::isWorkingSet() const {
  return container == VesselWorkingSetContainerItemIdentifier;
}

bool GatherScope::isAllDirectories() const {
  return container == VesselAllDirectoriesContainerItemIdentifier;
}

std::vector<URL> GatherScope::roots() const {
  if (!isRecursive()) return {URL::fileURL(urls.front().path())};
  std::vector<URL> roots;
  roots.reserve(2 * urls.size());
  for (const URL& url : urls)
    roots.push_back(URL::fileURL(url.path()));
  if (!isWorkingSet()) return roots;
  for (std::size_t i = 0; i < urls.size(); ++i)
    roots.push_back(roots[i].appendingPathComponent(trashName));
  return roots;
}

GatherPage::GatherPage(const ItemContext& context, const GatherScope& scope)
    : context_(context),
      scope_(scope),
      hiddenTest_(scope.urls, context.platform.resources),
      look_(context, hiddenTest_),
      names_(context, scope.isRecursive() ? scope.urls : std::vector{scope.urls.front()},
             scope.isRecursive() ? LinkNames::Depth::everything : LinkNames::Depth::children,
             hiddenTest_) {}

std::unique_ptr<FSDirectoryWalk> GatherPage::makeWalk() const {
  FSDirectoryWalk::Plan plan;
  plan.urls = scope_.roots();
  plan.recursively = scope_.isRecursive();
  plan.directoryEnumerationOptionsFor = optionsFor;
  if (scope_.isRecursive()) {
    plan.leavesOut = [](const URL&, const Error& error) { return saysOutOfReach(error); };
  }
  // Known from before they are opened, so that a folder that is moved meanwhile is found out.
  const ResourceReader reader(context_.platform.resources);
  for (const URL& url : plan.urls)
    static_cast<void>(reader.value(ResourceKey::fileIdentifier, url));
  return std::make_unique<FSDirectoryWalk>(std::move(plan), context_.platform.directories,
                                           context_.platform.resources);
}

Result<void> GatherPage::gather(FSDirectoryWalk& walk) {
  std::vector<URL> shown;
  const auto counted = walk.next(limit, [&](const URL& url) -> Result<void> {
    if (!hiddenTest_.isHidden(url)) shown.push_back(url);
    return {};
  });
  if (!counted) return fail(counted.error());
  entryCount_ = *counted;
  if (shown.empty()) return {};
  if (auto fetched = context_.platform.resources.prefetch(shown); !fetched) return fetched;
  std::vector<URL> listed;
  for (const URL& url : shown) {
    const auto isPassed = isPassedOver(url);
    if (!isPassed) return fail(isPassed.error());
    if (!*isPassed) listed.push_back(url);
  }
  std::vector<Result<std::shared_ptr<LocalItem>>> made(listed.size());
  splitWork(listed.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i)
      made[i] = look_.at(listed[i]);
  });
  for (std::size_t i = 0; i < listed.size(); ++i) {
    if (!made[i]) return fail(made[i].error());
    if (auto added = addItem(listed[i], *std::move(made[i])); !added) return added;
  }
  return {};
}

Result<void> GatherPage::addItem(const URL& url, std::shared_ptr<LocalItem> item) {
  if (item) {
    items_.push_back(std::move(item));
    return {};
  }
  const URL folder = url.deletingLastPathComponent();
  if (!hasMoved(folder)) return {};
  logInfo("folder \"" + folder.path() +
          "\" was moved while it was listed, need to re-start gather phase from scratch");
  return fail(Error::syncAnchorExpired());
}

/// Before an item is made of it: a document would get an identity for nothing.
Result<bool> GatherPage::isPassedOver(const URL& url) {
  if (!scope_.isAllDirectories()) return names_.isShownElsewhere(url);
  const auto type =
      ResourceReader(context_.platform.resources).value(ResourceKey::typeIdentifier, url);
  return type && *type != ResourceValue(std::string(folderTypeIdentifier));
}

/// Whether the folder that was opened there lies elsewhere by now: its entries have not gone.
bool GatherPage::hasMoved(const URL& folder) {
  if (checkedFolder_ && checkedFolder_->isSameObject(folder)) return false;
  const auto seen = folder.resources().snapshot();
  if (!seen) return true;
  const auto place = context_.identity.fileURLWithFileIdentifier(seen->fileID);
  if (place && place->properURL() != folder.properURL()) return true;
  checkedFolder_ = folder;
  return false;
}

}  // namespace mirabel
