#include "linux/icons/IconLookup.h"

#include <cstdint>
#include <limits>
#include <set>
#include <utility>

#include "linux/icons/BoundedFile.h"

namespace mirabel {
namespace {

constexpr const char* commonTheme = "hicolor";
constexpr std::size_t mostThemes = 16;

bool isComponent(std::string_view name) {
  constexpr std::string_view separators("/\0", 2);
  return !name.empty() && name != "." && name != ".." &&
         name.find_first_of(separators) == std::string_view::npos;
}

/// Names are to have no ending, and some have one all the same.
std::string_view withoutEnding(std::string_view name) {
  for (const std::string_view ending : {".png", ".svg", ".xpm"}) {
    if (name.size() > ending.size() && name.ends_with(ending)) {
      return name.substr(0, name.size() - ending.size());
    }
  }
  return name;
}

}  // namespace

std::optional<std::string> IconLookup::find(std::string_view name, const IconSize& size,
                                            const std::string& theme) {
  if (!isComponent(name)) return {};
  name_ = withoutEnding(name);
  if (auto found = findInThemes(size, theme)) return found;
  if (auto found = findInThemes(size, commonTheme)) return found;
  for (const std::string& folder : folders_.pixmaps) {
    if (auto found = fileBelow(folder)) return found;
  }
  return {};
}

/// The theme and those that it inherits from, each once: they may name each other.
std::optional<std::string> IconLookup::findInThemes(const IconSize& size,
                                                    const std::string& theme) {
  // The common one comes behind all others, whoever inherits from it.
  std::vector<std::string> toLook{theme};
  std::set<std::string> seen;
  while (!toLook.empty() && seen.size() < mostThemes) {
    const std::string next = std::move(toLook.back());
    toLook.pop_back();
    const bool isTooEarly = next == commonTheme && theme != commonTheme;
    if (isTooEarly || !isComponent(next) || !seen.insert(next).second) continue;
    const auto index = read(next);
    if (!index) continue;
    if (auto found = findIn(*index, next, size)) return found;
    toLook.insert(toLook.end(), index->inherits.rbegin(), index->inherits.rend());
  }
  return {};
}

std::optional<std::string> IconLookup::findIn(const IconTheme& index, const std::string& theme,
                                              const IconSize& size) const {
  for (const IconThemeDirectory& directory : index.directories) {
    if (!directory.matches(size)) continue;
    if (auto found = fileIn(theme, directory)) return found;
  }
  std::optional<std::string> nearest;
  std::int64_t least = std::numeric_limits<std::int64_t>::max();
  for (const IconThemeDirectory& directory : index.directories) {
    const std::int64_t distance = directory.distance(size);
    if (distance >= least) continue;
    auto found = fileIn(theme, directory);
    if (!found) continue;
    nearest = std::move(found);
    least = distance;
  }
  return nearest;
}

/// By the first index of that theme; its pictures lie in all of the folders.
std::optional<IconTheme> IconLookup::read(const std::string& theme) const {
  for (const std::string& folder : folders_.themes) {
    auto index = IconTheme::read(joinedPath({folder, theme, "index.theme"}));
    if (index) return *std::move(index);
  }
  if (theme == commonTheme) return IconTheme::hicolor();
  return {};
}

std::optional<std::string> IconLookup::fileIn(const std::string& theme,
                                              const IconThemeDirectory& directory) const {
  for (const std::string& folder : folders_.themes) {
    if (auto found = fileBelow(joinedPath({folder, theme, directory.path}))) return found;
  }
  return {};
}

std::optional<std::string> IconLookup::fileBelow(const std::string& folder) const {
  for (const std::string& ending : endings_) {
    std::string path = joinedPath({folder, name_});
    path += ending;
    if (isRegularFile(path)) return path;
  }
  return {};
}

}  // namespace mirabel
