#pragma once

#include <string>

namespace mirabel {

/// Whether this user may not read the folder, or may not look up names in it: either of the two
/// alone is of no use, for what can be looked up and not listed would be told and never shown, and
/// of what can be listed and not looked up nothing is known but its name. `folder` may be open with
/// O_PATH. False where that can't be found out.
[[nodiscard]] bool isClosed(int folder);

/// Whether one of the folders between `folder` and what lies at `relative` below it is closed. A
/// folder on the way that is not there is not closed.
[[nodiscard]] bool leadsThroughClosed(int folder, const std::string& relative);

}  // namespace mirabel
