#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "linux/volume/IndexContext.h"

namespace mirabel {

/// Names of the index that the disk does not have any more. Whether their objects are gone shows
/// only when everything else was looked at: they may have turned up elsewhere.
class MissingNames {
 public:
  explicit MissingNames(const IndexContext& context) : context_(context) {}

  /// Takes note of what the index has under that name, if anything.
  [[nodiscard]] Result<void> add(std::uint64_t folder, const std::string& name);
  void addObject(std::uint64_t slot, Location location) {
    missing_.push_back({slot, std::move(location), false});
  }
  void addLink(std::uint64_t slot, Location location) {
    missing_.push_back({slot, std::move(location), true});
  }
  [[nodiscard]] bool isEmpty() const { return missing_.empty(); }
  void clear() { missing_.clear(); }

  /// Takes in that what is still not found elsewhere is gone. Inside a transaction.
  [[nodiscard]] Result<void> settle();

 private:
  struct Missing {
    std::uint64_t slot;
    Location location;
    bool isLink;
  };
  [[nodiscard]] Result<void> settle(const Missing& missing);

  const IndexContext& context_;
  std::vector<Missing> missing_;
};

}  // namespace mirabel
