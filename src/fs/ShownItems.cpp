#include "fs/ShownItems.h"

namespace mirabel {
namespace {

std::vector<URL> rootsOf(const ItemContext& context, const AppLibraryRoots& roots) {
  std::vector<URL> urls = *roots.rootURLsForAppLibraries();
  urls.push_back(context.platform.manager.documentStorageURL());
  return urls;
}

}  // namespace

ShownItems::ShownItems(const ItemContext& context, const AppLibraryRoots& roots,
                       const std::vector<URL>& folders, LinkNames::Depth depth)
    : context_(context),
      containerSight_(folders, context.platform.resources),
      everywhereSight_(rootsOf(context, roots), context.platform.resources),
      look_(context_, everywhereSight_),
      containerNames_(context_,
                      depth == LinkNames::Depth::children ? std::vector{folders.front()} : folders,
                      depth, containerSight_),
      everywhereNames_(context_, rootsOf(context, roots), LinkNames::Depth::everything,
                       everywhereSight_) {}

Result<std::shared_ptr<LocalItem>> ShownItems::ofIdentifier(const std::string& identifier) {
  const auto url = context_.identity.findItem(identifier);
  if (!url) return fail(url.error());
  if (!*url) return nullptr;
  const auto place = placeOf(**url);
  if (!place) return fail(place.error());
  if (!*place) return nullptr;
  return look_.at(**place);
}

Result<std::shared_ptr<LocalItem>> ShownItems::asShown(const std::shared_ptr<LocalItem>& item) {
  const auto place = placeOf(item->url());
  if (!place) return fail(place.error());
  if (!*place) return nullptr;
  return **place == item->url() ? item : look_.at(**place);
}

Result<std::optional<URL>> ShownItems::placeOf(const URL& url) {
  if (!containerNames_.hasSeveral(url)) return isInSight(url) ? std::optional(url) : std::nullopt;
  auto place = containerNames_.shownName(url);
  if (!place || *place) return place;
  return everywhereNames_.shownName(url);
}

bool ShownItems::isInSight(const URL& url) const {
  return (containerSight_.isMonitored(url) && !containerSight_.isHidden(url)) ||
         (everywhereSight_.isMonitored(url) && !everywhereSight_.isHidden(url));
}

bool ShownItems::isOfContainer(const URL& url) const {
  return containerSight_.isMonitored(url);
}

}  // namespace mirabel
