#pragma once

#include "linux/volume/VolumeIndex.h"
#include "platform/VesselManager.h"

namespace mirabel {

/// The history of the one volume that is indexed. It does not depend on the URL.
class LinuxVolumeHistory final : public VolumeHistory {
 public:
  /// `index` outlives the history.
  explicit LinuxVolumeHistory(const VolumeIndex& index) : index_(index) {}

  Result<UUID> historyUUID(const URL&) override { return index_.historyUUID(); }

 private:
  const VolumeIndex& index_;
};

}  // namespace mirabel
