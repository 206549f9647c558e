#pragma once

#include "linux/operations/OperationContext.h"

namespace mirabel {

/// Copies what lies at `source`, which may be anywhere, into the folder at `folder` under its own
/// name, and answers where the copy lies. It is made under a hidden name and on disk before it gets
/// its own. Errors as `FileOperations` says; EINVAL for a folder that is to be copied into itself.
[[nodiscard]] Result<URL> importItem(const OperationContext& context, const URL& source,
                                     const URL& folder);

}  // namespace mirabel
