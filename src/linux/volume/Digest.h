#pragma once

#include <cstdint>
#include <span>

namespace mirabel {

/// 64 bits over bytes, never 0; different for any two that differ within eight bytes only. Finds
/// out accidents, not attackers: whoever can write here can write the documents as well. Kept in
/// files, so it must never change.
[[nodiscard]] std::uint64_t digestOf(std::span<const unsigned char> bytes, std::uint64_t seed = 0);

}  // namespace mirabel
