#include "linux/icons/IconFolders.h"

#include <algorithm>
#include <cstdlib>
#include <string_view>

#include "linux/icons/KeyFile.h"

namespace mirabel {
namespace {

using Reach = IconFolders::Reach;

constexpr std::size_t largestSettings = 64u << 10;
constexpr std::size_t mostFolders = 64;

std::string variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? "" : value;
}

// Relative paths in XDG variables are to be ignored.
std::string folderOf(const char* name, std::string standIn, Reach reach) {
  if (reach == Reach::homeAlone) return standIn;
  std::string value = variable(name);
  return value.starts_with('/') ? value : standIn;
}

std::vector<std::string> systemDataFolders() {
  std::vector<std::string> folders;
  const std::string list = variable("XDG_DATA_DIRS");
  std::string_view rest = list;
  while (!rest.empty() && folders.size() < mostFolders) {
    const std::string_view folder = rest.substr(0, rest.find(':'));
    rest.remove_prefix(std::min(rest.size(), folder.size() + 1));
    if (folder.starts_with('/')) folders.emplace_back(folder);
  }
  if (folders.empty()) folders = {"/usr/local/share", "/usr/share"};
  // Where the session does not name them, as in a service.
  folders.emplace_back("/var/lib/flatpak/exports/share");
  return folders;
}

}  // namespace

IconFolders IconFolders::of(const std::string& home, Reach reach) {
  const std::string data = folderOf("XDG_DATA_HOME", home + "/.local/share", reach);
  std::vector<std::string> dataFolders{data, data + "/flatpak/exports/share"};
  if (reach == Reach::wholeMachine) {
    for (std::string& folder : systemDataFolders()) {
      if (std::ranges::find(dataFolders, folder) == dataFolders.end()) {
        dataFolders.push_back(std::move(folder));
      }
    }
  }
  IconFolders folders;
  folders.themes.push_back(home + "/.icons");
  for (const std::string& folder : dataFolders) {
    folders.applications.push_back(folder + "/applications");
    folders.themes.push_back(folder + "/icons");
    folders.pixmaps.push_back(folder + "/pixmaps");
  }
  return folders;
}

std::string chosenIconTheme(const std::string& home, Reach reach) {
  const std::string configuration = folderOf("XDG_CONFIG_HOME", home + "/.config", reach);
  for (const char* toolkit : {"gtk-4.0", "gtk-3.0"}) {
    const auto settings =
        KeyFile::read(configuration + "/" + toolkit + "/settings.ini", largestSettings);
    if (!settings) continue;
    const auto theme = settings->text("Settings", "gtk-icon-theme-name");
    if (theme && !theme->empty()) return *theme;
  }
  return "hicolor";
}

}  // namespace mirabel
