#include "linux/apps/ApplicationDirectories.h"

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <string_view>

#include "foundation/URL.h"

namespace mirabel {
namespace {

// More than anybody has, and few enough to ask each of them for each lookup.
constexpr std::size_t mostDirectories = 64;
constexpr std::string_view flatpakExports = "/flatpak/exports/share";

std::string variable(const char* name, std::string standIn) {
  const char* value = std::getenv(name);
  return value == nullptr || *value == '\0' ? std::move(standIn) : value;
}

bool holds(const std::vector<std::string>& directories, const std::string& path) {
  return std::ranges::find(directories, path) != directories.end();
}

// Relative paths in XDG variables are to be ignored.
void add(std::vector<std::string>& directories, std::string_view dataDirectory,
         const std::vector<std::string>& before = {}) {
  if (!dataDirectory.starts_with('/') || directories.size() == mostDirectories) return;
  std::string path = URL::fileURL(dataDirectory).appendingPathComponent("applications").path();
  if (path.empty() || holds(directories, path) || holds(before, path)) return;
  directories.push_back(std::move(path));
}

}  // namespace

ApplicationDirectories ApplicationDirectories::of(const std::string& home, Reach reach) {
  const bool isWhole = reach == Reach::wholeMachine;
  std::string dataHome = home + "/.local/share";
  if (isWhole) {
    const std::string given = variable("XDG_DATA_HOME", dataHome);
    if (given.starts_with('/')) dataHome = given;
  }
  ApplicationDirectories directories;
  add(directories.user, dataHome);
  add(directories.user, dataHome + std::string(flatpakExports));
  if (!isWhole) return directories;
  // Desktops put Flatpak's directories into the variable too, the user's among them.
  const std::string list = variable("XDG_DATA_DIRS", "/usr/local/share:/usr/share");
  for (std::size_t start = 0; start <= list.size();) {
    const std::size_t end = std::min(list.find(':', start), list.size());
    add(directories.system, std::string_view(list).substr(start, end - start), directories.user);
    start = end + 1;
  }
  add(directories.system, "/var/lib" + std::string(flatpakExports), directories.user);
  return directories;
}

}  // namespace mirabel
