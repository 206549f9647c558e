#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "linux/volume/ListingSlot.h"
#include "linux/volume/StateFolder.h"
#include "mirabel/UniqueFd.h"
#include "platform/ListingPositions.h"

namespace mirabel {

/// The positions of listings in the file "listings" of the volume's state folder, which is read
/// when it is first asked for. Each has a slot of its own that is written over in place and
/// synchronised: a write that is cut short costs the position that it replaced, or is no position,
/// but no other. See docs/formats/listing-positions.md.
class StoredListingPositions final : public ListingPositions {
 public:
  static constexpr std::size_t slotCount = 64;
  static constexpr std::size_t slotSize = 8u << 10;
  /// That one container may have: a listing that is under way has no need of its old ones, but
  /// several hosts may list.
  static constexpr std::size_t mostOfOne = 8;

  /// `folder` outlives this.
  explicit StoredListingPositions(const StateFolder& folder) : folder_(folder) {}

  Result<void> keep(std::string_view container, const Data& cursor, const Data& position) override;
  std::optional<Data> find(std::string_view container, const Data& cursor) override;

 private:
  using Slot = ListingSlot;
  void load();
  [[nodiscard]] Result<void> make();
  [[nodiscard]] Slot& slotFor(std::string_view container, const Data& cursor);

  const StateFolder& folder_;
  std::mutex mutex_;
  bool isLoaded_ = false;
  UniqueFd file_;
  std::uint64_t lastNumber_ = 0;
  std::array<Slot, slotCount> slots_;
};

}  // namespace mirabel
