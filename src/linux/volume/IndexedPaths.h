#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/IdentityStore.h"
#include "mirabel/Error.h"

namespace mirabel {

/// The paths of places in the index, and whether the disk agrees. Used under the lock of the index.
/// Errors: `ErrorDomain::store`, and of a look at the disk the passing ones, see `LookFailure`.
class IndexedPaths {
 public:
  /// References outlive it. `device` is the number of the volume's own file system.
  IndexedPaths(IdentityStore& store, const MonitoredRoots& roots, std::uint64_t device)
      : store_(store), roots_(roots), device_(device) {}

  /// Where the index believes a place to be; nothing when a folder above it is detached.
  [[nodiscard]] Result<std::optional<std::string>> pathOf(const Location& location) const;
  /// The same for the folder of a row that has a place; kept at hand for what lies in it.
  [[nodiscard]] Result<std::optional<std::string>> pathOfFolder(const ObjectRow& row) const;
  /// File IDs of the folders above a place as the index has them, the outermost first.
  [[nodiscard]] Result<std::vector<std::uint64_t>> foldersAbove(const Location& location) const;
  /// The path of a place, if the disk has the object of `row` there.
  [[nodiscard]] Result<std::optional<std::string>> standingPath(const ObjectRow& row,
                                                                const Location& location) const;
  /// The same for every name that the index has for the object.
  [[nodiscard]] Result<std::vector<std::string>> standingPaths(const ObjectRow& row) const;
  /// Whether the folder of a place lies where the index has it.
  [[nodiscard]] Result<bool> folderStands(const Location& location) const;
  [[nodiscard]] Result<bool> isAt(const ObjectRow& row, const Location& location) const;

 private:
  [[nodiscard]] Result<std::optional<std::string>> folderPath(std::uint64_t folder) const;

  IdentityStore& store_;
  const MonitoredRoots& roots_;
  std::uint64_t device_;
};

}  // namespace mirabel
