#pragma once

#include <atomic>
#include <cstdint>

namespace mirabel {

/// How far the operations of this process have come, all of them together since it started. Any
/// thread may read it while they run.
struct OperationProgress {
  std::atomic<std::uint64_t> entriesCopied = 0;
  std::atomic<std::uint64_t> bytesCopied = 0;
  std::atomic<std::uint64_t> entriesRemoved = 0;
};

}  // namespace mirabel
