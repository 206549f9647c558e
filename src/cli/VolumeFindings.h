#pragma once

#include <string>
#include <vector>

#include "cli/Finding.h"
#include "mirabel/StatusReport.h"

namespace mirabel {

/// What the file system that holds `folder` keeps. Nothing where the folder can't be looked at.
[[nodiscard]] std::vector<Finding> volumeFindings(const std::string& folder);

/// Whether folders are watched for changes: as `status` has it, or else, where there is none, as it
/// comes out for this one folder.
[[nodiscard]] Finding watchingFinding(const std::string& folder, const StatusReport* status);

}  // namespace mirabel
