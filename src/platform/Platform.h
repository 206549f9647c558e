#pragma once

#include "foundation/ExtendedAttributes.h"
#include "foundation/ResourceValues.h"
#include "platform/ApplicationRegistry.h"
#include "platform/CacheFiles.h"
#include "platform/Clock.h"
#include "platform/DirectorySizer.h"
#include "platform/DirectoryStreams.h"
#include "platform/FileObjects.h"
#include "platform/FileOperations.h"
#include "platform/GenerationalStore.h"
#include "platform/ListingPositions.h"
#include "platform/VesselManager.h"
#include "platform/VolumeHistory.h"

namespace mirabel {

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
  ListingPositions& positions;
  CacheFiles& caches;
};

}  // namespace mirabel
