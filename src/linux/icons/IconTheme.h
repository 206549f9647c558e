#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel {

/// Sizes are in points, as themes count them.
struct IconSize {
  int size = 48;
  int scale = 1;
};

/// One directory of a theme, with what its index says of the pictures in it.
struct IconThemeDirectory {
  enum class Type { fixed, scalable, threshold };

  std::string path;  ///< below the theme's folder
  Type type = Type::threshold;
  int size = 0;
  int scale = 1;
  int minSize = 0;
  int maxSize = 0;
  int threshold = 2;

  /// Whether its pictures are meant for the size.
  [[nodiscard]] bool matches(const IconSize& wanted) const;
  /// By how many pixels they miss it.
  [[nodiscard]] std::int64_t distance(const IconSize& wanted) const;
};

/// The directories of a theme, in the order in which they are looked through, and the themes whose
/// pictures stand in for those that it does not have.
struct IconTheme {
  std::vector<IconThemeDirectory> directories;
  std::vector<std::string> inherits;

  /// Reads an "index.theme". Directories that are no folders below it (that hold "..", say), have
  /// no size or one beyond all reason are left out. POSIX errors: those of `KeyFile::read`.
  [[nodiscard]] static Result<IconTheme> read(const std::string& path);
  /// The same for what such a file holds.
  [[nodiscard]] static Result<IconTheme> parse(std::string_view text);
  /// What "hicolor" has by convention, for folders that lack its index: applications put their
  /// icons there without one.
  [[nodiscard]] static IconTheme hicolor();
};

}  // namespace mirabel
