#pragma once

#include "mirabel/Error.h"
#include "mirabel/StatusReport.h"

namespace mirabel {

class HostedProvider;

/// Error: that the index can't be brought in step with the disk.
[[nodiscard]] Result<StatusReport> statusOf(const HostedProvider& provider);

}  // namespace mirabel
