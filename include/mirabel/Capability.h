#pragma once

#include <cstdint>

namespace mirabel {

/// What the host may do with an item; the host's bit values.
enum Capability : std::uint64_t {
  capabilityReading = 1,  ///< and enumerating the contents
  capabilityWriting = 2,  ///< and adding sub-items
  capabilityReparenting = 4,
  capabilityRenaming = 8,
  capabilityTrashing = 16,
  capabilityDeleting = 32,
};

}  // namespace mirabel
