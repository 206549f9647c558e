#pragma once

#include "linux/operations/OperationContext.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {

/// Clears away or finishes what operations of earlier processes left when they were killed: hidden
/// copies are removed, a removal that was begun is finished, so is a move to another file system
/// when the copy has its name, and else it is undone, an item that had a hidden name for a moment
/// gets one of its names. Whatever can't be done now stays on record. To be called once, before the
/// first operation.
void recoverOperations(const OperationContext& context, VolumeIndex& index);

}  // namespace mirabel
