#pragma once

#include <string>
#include <string_view>

#include "foundation/ResourceValues.h"
#include "linux/files/TypeTable.h"
#include "linux/kernel/EntryPlace.h"
#include "linux/volume/VolumeIndex.h"
#include "mirabel/Error.h"

namespace mirabel {

class URL;

/// What looking at one object needs; references that outlive it.
struct LookContext {
  const MonitoredRoots& roots;
  VolumeIndex& index;
  TypeTable& types;
};

/// Looks at the object at `url`: one statx, an access check, and its identity from the index.
/// POSIX errors, and `ErrorDomain::store` where the index cannot be written.
[[nodiscard]] Result<ResourceValues> lookAtObject(const LookContext& context, const URL& url);

/// The values of an object that has been looked at and identified. `name` is its own name, also
/// where the sighting has none.
[[nodiscard]] ResourceValues valuesOf(TypeTable& types, std::string_view name,
                                      const Sighting& sighting, bool isWritable);

/// Whether this process, with its effective identity, may write the object at (`folder`, `name`);
/// a final symbolic link is not followed.
[[nodiscard]] bool mayWrite(int folder, const std::string& name);

}  // namespace mirabel
