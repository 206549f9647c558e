#pragma once

#include <chrono>

#include "foundation/ExtendedAttributes.h"
#include "foundation/ResourceValues.h"
#include "platform/ApplicationRegistry.h"
#include "platform/DirectoryStreams.h"
#include "platform/FileObjects.h"
#include "platform/FileOperations.h"
#include "platform/GenerationalStore.h"
#include "platform/VesselManager.h"

namespace mirabel {

/// Time as the logic sees it.
class Clock {
 public:
  virtual ~Clock() = default;
  [[nodiscard]] virtual Date now() = 0;
  virtual void sleep(std::chrono::milliseconds duration) = 0;
};

/// Everything that the logic asks of the machine and of the host. References to objects that
/// outlive it; copied freely.
struct Platform {
  ResourceValueSource& resources;
  ExtendedAttributeStore& attributes;
  FileObjects& objects;
  GenerationalStore& documents;
  DirectoryStreams& directories;
  DirectorySizer& sizes;
  FileOperations& operations;
  ApplicationRegistry& applications;
  VesselManager& manager;
  VolumeHistory& history;
  Clock& clock;
};

}  // namespace mirabel
