#pragma once

#include <optional>
#include <string>

#include "mirabel/Error.h"

namespace mirabel {

/// Where the things of one person lie. All paths are absolute; those of folders that exist are
/// without symbolic links.
struct HomeLayout {
  std::string home;
  std::string documents;
  std::string stateFolder;
  /// $XDG_DATA_HOME, or what stands for it below a home that was given. Need not exist.
  std::string applicationSupport;

  /// The choices that a person may make; see `LinuxPlatform::Options`.
  struct Choices {
    std::optional<std::string> home;
    std::optional<std::string> documents;
    std::optional<std::string> stateFolder;
  };
  /// POSIX errors with a detail for people. Makes nothing.
  [[nodiscard]] static Result<HomeLayout> resolve(const Choices& choices);
};

/// `path` absolute and without symbolic links; as it stands, but absolute, when it does not exist.
/// POSIX errors other than ENOENT.
[[nodiscard]] Result<std::string> resolvedPath(const std::string& path);

}  // namespace mirabel
