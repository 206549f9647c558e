#pragma once

#include <string>
#include <vector>

namespace mirabel {

/// Where icons and desktop entries lie, the most important folder first. Absolute; any of them may
/// be missing.
struct IconFolders {
  std::vector<std::string> applications;  ///< of desktop entries
  std::vector<std::string> themes;        ///< each holds themes, one folder a theme
  std::vector<std::string> pixmaps;       ///< pictures of no theme

  /// Whether the XDG variables and the folders of the system count, or what is in the home alone.
  enum class Reach { homeAlone, wholeMachine };
  /// Those of the person whose home that is, Flatpak's exports among them. Looks at no file.
  [[nodiscard]] static IconFolders of(const std::string& home, Reach reach);
};

/// The icon theme that the person chose for the desktop's programs; "hicolor" where none is known.
/// Nothing outside the home is looked at, nor any variable, unless the whole machine counts.
[[nodiscard]] std::string chosenIconTheme(const std::string& home, IconFolders::Reach reach);

}  // namespace mirabel
