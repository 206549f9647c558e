#include "provider/TrashPlaces.h"

#include <algorithm>
#include <string_view>

#include "foundation/Log.h"
#include "fs/LogText.h"

namespace mirabel {

std::optional<std::vector<std::string>> trashComponents(const URL& item) {
  const auto path = item.pathComponents();
  const auto documents = std::ranges::find(path, "Documents");
  if (documents == path.end()) return {};
  std::vector<std::string> components(path.begin(), documents + 1);
  components.emplace_back(".Trash");
  return components;
}

Result<URL> trashFolderAt(const std::vector<std::string>& components) {
  std::string path;
  for (const std::string& component : components) {
    if (!path.empty() && path != "/") path += '/';
    path += component;
  }
  URL folder = URL::fileURL(path);
  if (!folder.path().empty()) return folder;
  const std::string list = listOfTexts(components);
  logError("can't build trash URL from components " + quoted(list));
  return fail(Error::invalidParameter("trashComponents", list));
}

Result<URL> trashFolderFor(const URL& item) {
  const auto components = trashComponents(item);
  if (components) return trashFolderAt(*components);
  logError("no Documents directory found in path " + quoted(item.path()));
  return fail(Error::invalidParameter("sourceURL", item.description()));
}

std::optional<std::string> putBackString(const URL& item, const URL& libraryRoot) {
  const URL canonicalItem = item.properURL();
  const URL canonicalRoot = libraryRoot.properURL();
  const auto path = canonicalItem.pathComponents();
  const auto root = canonicalRoot.pathComponents();
  const auto [behindRoot, rootEnd] = std::ranges::mismatch(path, root);
  if (rootEnd != root.end()) return {};
  std::string relative;
  for (auto component = behindRoot; component != path.end(); ++component) {
    if (component != behindRoot) relative += '/';
    relative += *component;
  }
  return relative;
}

}  // namespace mirabel
