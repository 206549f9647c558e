#pragma once

#include <cstdint>
#include <functional>
#include <string_view>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/ChangeRecorder.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/IndexedPaths.h"
#include "linux/volume/Learner.h"

namespace mirabel {

/// What those work with who bring the index in step with the disk; all of it outlives them. Used
/// under the lock of the index.
struct IndexContext {
  Learner& learner;
  IdentityStore& store;
  ChangeRecorder& recorder;
  const IndexedPaths& paths;
  const MonitoredRoots& roots;
  std::uint64_t device;  ///< number of the volume's own file system
  std::function<bool(std::string_view name)> isPackageName;
};

/// Runs a piece of work in a transaction of its own.
using Transaction = std::function<Result<void>(const std::function<Result<void>()>&)>;

/// One transaction's worth of entries.
inline constexpr std::size_t entriesPerTransaction = 4096;

/// Something that has to be done every so many entries, in the middle of longer work.
using Pause = std::function<Result<void>()>;
inline constexpr std::size_t entriesPerPause = 1024;

}  // namespace mirabel
