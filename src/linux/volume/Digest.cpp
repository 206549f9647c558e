#include "linux/volume/Digest.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstring>

namespace mirabel {
namespace {

constexpr std::size_t wordSize = 8;
constexpr std::size_t laneCount = 4;

// One to one in either argument while the other stays.
std::uint64_t mixed(std::uint64_t state, std::uint64_t word) {
  return std::rotl((state ^ word) * 0x9E3779B97F4A7C15ULL, 31) + 0xD6E8FEB86659FD93ULL;
}

std::uint64_t wordAt(std::span<const unsigned char> bytes) {
  std::uint64_t word = 0;
  std::memcpy(&word, bytes.data(), std::min(wordSize, bytes.size()));
  return word;
}

}  // namespace

std::uint64_t digestOf(std::span<const unsigned char> bytes, std::uint64_t seed) {
  const std::size_t size = bytes.size();
  // Lanes that do not wait for each other: half a microsecond for a page.
  std::array<std::uint64_t, laneCount> lanes{seed, ~seed, seed + 1, ~seed - 1};
  while (bytes.size() >= wordSize * laneCount) {
    for (std::size_t lane = 0; lane < laneCount; ++lane) {
      lanes[lane] = mixed(lanes[lane], wordAt(bytes.subspan(lane * wordSize)));
    }
    bytes = bytes.subspan(wordSize * laneCount);
  }
  for (std::size_t lane = 0; !bytes.empty(); ++lane) {
    lanes[lane] = mixed(lanes[lane], wordAt(bytes));
    bytes = bytes.subspan(std::min(wordSize, bytes.size()));
  }
  std::uint64_t state = mixed(seed, size);
  for (const std::uint64_t value : lanes)
    state = mixed(state, value);
  state ^= state >> 29;
  return state == 0 ? 1 : state;
}

}  // namespace mirabel
