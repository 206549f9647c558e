#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/icons/IconFolders.h"
#include "linux/icons/IconTheme.h"

namespace mirabel {

/// Finds the file of an icon by the rules of the desktops' icon themes: the theme, those that it
/// inherits from, "hicolor", and then the pictures of no theme; of a theme the first directory that
/// is meant for the size, and else the one that misses it least. Looks at the disk anew each time.
/// Owned by whoever looks for one icon; used by one thread.
class IconLookup {
 public:
  /// `endings` are those of the files that can be read (".png"), the best first. The folders
  /// outlive this.
  IconLookup(const IconFolders& folders, std::vector<std::string> endings)
      : folders_(folders), endings_(std::move(endings)) {}

  /// The path of a regular file, or of a link to one. Nothing for a name that is none: an empty
  /// one, "..", one that holds slashes or a NUL byte.
  [[nodiscard]] std::optional<std::string> find(std::string_view name, const IconSize& size,
                                                const std::string& theme);

 private:
  [[nodiscard]] std::optional<std::string> findInThemes(const IconSize& size,
                                                        const std::string& theme);
  [[nodiscard]] std::optional<std::string> findIn(const IconTheme& index, const std::string& theme,
                                                  const IconSize& size) const;
  [[nodiscard]] std::optional<IconTheme> read(const std::string& theme) const;
  [[nodiscard]] std::optional<std::string> fileBelow(const std::string& folder) const;
  [[nodiscard]] std::optional<std::string> fileIn(const std::string& theme,
                                                  const IconThemeDirectory& directory) const;

  const IconFolders& folders_;
  std::vector<std::string> endings_;
  std::string name_;
};

}  // namespace mirabel
