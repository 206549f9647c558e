#pragma once

#include <string>
#include <vector>

namespace mirabel {

/// The directories that desktop entries are looked for in, the most important first: an entry
/// hides those of the same identifier in the directories after it. Absolute paths, each once; any
/// of them may be missing.
struct ApplicationDirectories {
  std::vector<std::string> user;    ///< applications of type 0
  std::vector<std::string> system;  ///< applications of type 2, behind those of the user

  /// Whether the XDG variables and the system's directories count, or what is in the home alone.
  enum class Reach { homeAlone, wholeMachine };
  /// Those of the person whose home that is. Looks at no file.
  [[nodiscard]] static ApplicationDirectories of(const std::string& home, Reach reach);
};

}  // namespace mirabel
