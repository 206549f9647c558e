#pragma once

#include "linux/operations/OperationContext.h"

namespace mirabel {

/// Removes the item. A folder is renamed to a hidden name first: from then on it is gone, and what
/// can't be removed of it is left to the next start. Errors as `FileOperations` says; nothing is
/// removed of a folder in which something may not be.
[[nodiscard]] Result<void> removeItem(const OperationContext& context, const URL& item);

}  // namespace mirabel
