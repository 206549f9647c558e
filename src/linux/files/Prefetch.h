#pragma once

#include <span>

#include "linux/files/ObjectLook.h"
#include "mirabel/Error.h"

namespace mirabel {

class URL;

/// Looks at many objects and fills the resource caches of their URLs: per folder one open and one
/// round of the index, per object one statx and one listxattr, the latter on two threads when
/// there are many. A URL that cannot be looked at is passed over. Errors: those of the index.
[[nodiscard]] Result<void> prefetchAll(const LookContext& context, std::span<const URL> urls);

}  // namespace mirabel
