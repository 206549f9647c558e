#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string_view>

#include "linux/watch/LookList.h"

namespace mirabel {

/// One record of inotify; the name is a view into the bytes that it was decoded from, and empty
/// for what concerns the folder itself.
struct InotifyRecord {
  int watch = 0;
  std::uint32_t mask = 0;  ///< IN_… bits
  std::string_view name{};
};

/// Decodes what one read returned, record by record. False on bytes that no kernel writes.
[[nodiscard]] bool decodeInotify(std::span<const std::byte> bytes,
                                 const std::function<void(const InotifyRecord&)>& visit);

/// Adds the place that a record says to look at, for a folder that is watched as `folder`. False
/// for one that says that records were dropped.
[[nodiscard]] bool addLook(const InotifyRecord& record, std::optional<std::uint64_t> folder,
                           LookList& looks);

}  // namespace mirabel
