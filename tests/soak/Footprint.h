#pragma once

#include <cstddef>
#include <sys/types.h>

namespace mirabel::testing {

/// What a process holds.
struct Footprint {
  std::size_t residentKiB = 0;
  std::size_t descriptors = 0;
};

/// Listings that were left in the middle stay open for whoever goes on with them; so many of them.
inline constexpr std::size_t mostOpenListings = 16;
/// How much more memory a service may hold than it did before.
inline constexpr std::size_t mostGrowthKiB = 8192;

[[nodiscard]] Footprint footprintOf(pid_t process);

[[nodiscard]] bool isAsBefore(const Footprint& now, const Footprint& before);

/// Waits until a service that all have left holds what it did before, for a while at most, and
/// answers what it holds then.
[[nodiscard]] Footprint settled(pid_t process, const Footprint& before);

}  // namespace mirabel::testing
