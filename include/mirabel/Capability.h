#pragma once

#include <cstdint>

namespace mirabel {

/// What a program may do with an item, as bits. Those of what the user may not write, and of the
/// root, are reading alone.
enum Capability : std::uint64_t {
  capabilityReading = 1,  ///< and enumerating the contents
  capabilityWriting = 2,  ///< and adding sub-items
  capabilityReparenting = 4,
  capabilityRenaming = 8,
  capabilityTrashing = 16,
  capabilityDeleting = 32,
};

}  // namespace mirabel
