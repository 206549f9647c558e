#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string_view>

#include "linux/watch/LookList.h"

namespace mirabel {

/// One record of fanotify. The views are into the bytes that it was decoded from. Handles have the
/// form of `handleAt`.
struct FanotifyRecord {
  struct Name {
    std::string_view folder;  ///< handle
    std::string_view name;    ///< "." for the folder itself
    friend bool operator==(const Name&, const Name&) = default;
  };
  std::uint64_t mask = 0;  ///< FAN_… bits
  /// Where it happened; of a rename the two ends, of which one is missing when its folder is not
  /// watched.
  std::optional<Name> place{};
  std::optional<Name> from{};
  std::optional<Name> to{};
  std::string_view target{};  ///< handle of the object that it happened to; may be empty
};

/// Decodes what one read returned, record by record. False, with those before told, on bytes that
/// no kernel of this interface version writes.
[[nodiscard]] bool decodeFanotify(std::span<const std::byte> bytes,
                                  const std::function<void(const FanotifyRecord&)>& visit);

/// The number under which a folder is watched; nothing for one that is not.
using WatchedFolder = std::function<std::optional<std::uint64_t>(std::string_view handle)>;

/// The places that a record says to look at. False for one that says that records were dropped.
[[nodiscard]] bool addLooks(const FanotifyRecord& record, const WatchedFolder& watched,
                            LookList& looks);

}  // namespace mirabel
