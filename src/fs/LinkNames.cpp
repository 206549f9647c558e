#include "fs/LinkNames.h"

#include <algorithm>
#include <string_view>

namespace mirabel {
namespace {

bool isBelow(const URL& url, const URL& folder) {
  const std::string_view path = url.path();
  const std::string_view above = folder.path();
  return path.size() > above.size() && path.starts_with(above) &&
         (above.ends_with('/') || path[above.size()] == '/');
}

}  // namespace

LinkNames::LinkNames(const ItemContext& context, const std::vector<URL>& folders, Depth depth,
                     const HiddenTest& hiddenTest)
    : context_(context),
      storage_(context.platform.manager.documentStorageURL().properURL()),
      depth_(depth),
      hiddenTest_(hiddenTest),
      reader_(context.platform.resources) {
  for (const URL& folder : folders)
    folders_.push_back(folder.properURL());
}

bool LinkNames::hasSeveral(const URL& url) const {
  const auto count = reader_.value(ResourceKey::linkCount, url);
  const Number* number = count ? std::get_if<Number>(&*count) : nullptr;
  return number != nullptr && number->asUnsigned().value_or(1) > 1;
}

Result<std::optional<URL>> LinkNames::shownName(const URL& url) {
  const auto names = namesOf(url);
  if (!names) return fail(names.error());
  const auto shown = std::ranges::find_if(*names, [&](const URL& name) { return isListed(name); });
  if (shown == names->end()) return std::nullopt;
  // With a cache of its own: an item is made of it, and its folders may have changed.
  return URL::fileURL(shown->path());
}

Result<bool> LinkNames::isShownElsewhere(const URL& entry) {
  if (!hasSeveral(entry)) return false;
  const auto names = namesOf(entry);
  if (!names) return fail(names.error());
  // Those before it decide; of itself it is known.
  const auto itself = std::ranges::find(*names, entry.properURL(), &URL::properURL);
  return std::any_of(names->begin(), itself, [&](const URL& name) { return isListed(name); });
}

/// In the order in which they are preferred.
Result<std::vector<URL>> LinkNames::namesOf(const URL& url) {
  const auto fileID = reader_.value(ResourceKey::fileIdentifier, url);
  const Number* number = fileID ? std::get_if<Number>(&*fileID) : nullptr;
  if (number == nullptr) return std::vector<URL>();
  const auto device =
      context_.identity.deviceIDWithError(context_.platform.manager.documentStorageURL());
  if (!device) return fail(device.error());
  const auto paths =
      context_.platform.objects.pathsOfFileID(*device, number->asUnsigned().value_or(0));
  if (!paths) return fail(paths.error());
  std::vector<URL> names;
  for (const std::string& path : *paths)
    names.push_back(urls_.at(path));
  std::ranges::sort(names, {}, [&](const URL& name) {
    return std::tuple(rankOf(name), name.properURL().path());
  });
  return names;
}

LinkNames::Rank LinkNames::rankOf(const URL& name) const {
  const URL canonical = name.properURL();
  const bool isInTrash = std::ranges::any_of(folders_, [&](const URL& folder) {
    return isBelow(canonical, folder.appendingPathComponent(".Trash"));
  });
  return {isInTrash, !isBelow(canonical, storage_)};
}

bool LinkNames::isListed(const URL& name) const {
  if (hiddenTest_.isHidden(name)) return false;
  if (depth_ == Depth::everything) return true;
  return name.properURL().deletingLastPathComponent() == folders_.front();
}

}  // namespace mirabel
