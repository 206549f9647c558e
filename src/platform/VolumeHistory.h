#pragma once

#include "foundation/URL.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Knows which history the identifiers and events of a volume belong to. Any thread may call it.
class VolumeHistory {
 public:
  virtual ~VolumeHistory() = default;
  /// Another value means that anchors and pages made before are void.
  [[nodiscard]] virtual Result<UUID> historyUUID(const URL& url) = 0;
};

}  // namespace mirabel
