#pragma once

#include <string_view>

namespace mirabel {

/// The folders that are shown as one document, told by the suffix of their name. The table is
/// built in; docs/formats/package-types.md lists it for people. Any thread may call it.
class PackageTypes {
 public:
  /// The type identifier of a folder called `name`, empty for an ordinary folder. Suffixes are
  /// compared without regard to ASCII case, and need a name before them: ".quill" is hidden, and
  /// no package. The view lives as long as the process.
  [[nodiscard]] static std::string_view typeOf(std::string_view name);
  [[nodiscard]] static bool isPackageName(std::string_view name) { return !typeOf(name).empty(); }
};

}  // namespace mirabel
