#pragma once

#include <string>
#include <vector>

#include "platform/VesselManager.h"

namespace mirabel {

/// Has the host take everything that was indexed of these app libraries out of the search index:
/// the domain of an app library is the bundle identifier of its application. Waits without a limit
/// until the host has answered; a failure is logged and not tried again.
void deleteIndexOfDeletedAppLibraries(VesselManager& manager,
                                      const std::vector<std::string>& itemIdentifiers);

}  // namespace mirabel
