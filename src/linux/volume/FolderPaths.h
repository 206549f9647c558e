#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>

#include "linux/volume/ObjectRow.h"

namespace mirabel {

/// Paths of folders as the index has them, so that not every place in a folder costs a look-up of
/// everything above it. A bounded number. Whoever writes a row says so; any folder that changes
/// its place may be above any other, so that all are forgotten then. Used under the lock of the
/// index.
class FolderPaths {
 public:
  [[nodiscard]] const std::string* find(std::uint64_t folder) const {
    const auto known = known_.find(folder);
    return known == known_.end() ? nullptr : &known->second.path;
  }
  void add(std::uint64_t folder, Location location, std::string path) {
    constexpr std::size_t most = 16'384;
    if (known_.size() >= most) known_.clear();
    known_.insert_or_assign(folder, Known{std::move(location), std::move(path)});
  }
  /// The row is about to be written.
  void writes(const ObjectRow& row) {
    const auto known = known_.find(row.fileID);
    if (known != known_.end() && row.location != known->second.location) known_.clear();
  }
  void clear() { known_.clear(); }

 private:
  struct Known {
    Location location;
    std::string path;
  };
  std::unordered_map<std::uint64_t, Known> known_;
};

}  // namespace mirabel
