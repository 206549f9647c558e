#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "linux/volume/IndexContext.h"
#include "linux/volume/RecentPlaces.h"
#include "linux/watch/LookList.h"

namespace mirabel {

/// Collects the names that change from the records as they come.
class RecentNames {
 public:
  explicit RecentNames(const IndexContext& context) : context_(context) {}

  /// Adds the names that came or left.
  void add(const LookList& looks);
  void clear();
  /// See `RecentPlaces::placesOf`.
  [[nodiscard]] Result<std::vector<RecentPlace>> placesOf(std::uint64_t inode);

 private:
  struct Name {
    std::uint64_t folder;
    std::string name;
  };
  [[nodiscard]] Result<void> lookAt(const Name& name);

  const IndexContext& context_;
  std::vector<Name> unseen_;  // not looked at yet
  std::unordered_multimap<std::uint64_t, Name> byInode_;
};

}  // namespace mirabel
