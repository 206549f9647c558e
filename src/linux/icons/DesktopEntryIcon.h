#pragma once

#include <string>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel {

/// What the desktop entry of the application says under "Icon": the name of an icon in a theme, or
/// an absolute path. The entry is "<identifier>.desktop" in the first of the folders that has one.
/// POSIX errors: ENOENT where there is no entry or it names no icon, EINVAL for an identifier that
/// is no file name, else those of `KeyFile::read`.
[[nodiscard]] Result<std::string> iconOfDesktopEntry(const std::vector<std::string>& folders,
                                                     const std::string& identifier);

}  // namespace mirabel
