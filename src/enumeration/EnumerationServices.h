#pragma once

#include "enumeration/OpenWalks.h"
#include "fs/ChangesEnumeration.h"
#include "items/LocalItem.h"
#include "platform/DiagnosticReporter.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// Whether the host is to be told by itself that a container has changed.
enum class LiveUpdates { wanted, unwanted };

/// What following changes needs beyond the items: references that outlive who gets it.
struct ChangeServices {
  EventStreams& events;
  DiagnosticReporter& diagnostics;
  ChangesEnumerations& changes;
};

/// What the enumerators of one provider share; what it refers to outlives every enumerator.
struct EnumerationServices {
  ItemContext items;
  ChangeServices changes;
  OpenWalks& walks;
};

}  // namespace mirabel
