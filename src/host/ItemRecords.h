#pragma once

#include <memory>
#include <vector>

#include "mirabel/ItemRecord.h"

namespace mirabel {

class LocalItem;

/// What programs get of the provider's items. The fields are those of `LocalItem`.
[[nodiscard]] ItemRecord recordOf(const LocalItem& item);
[[nodiscard]] std::vector<ItemRecord> recordsOf(
    const std::vector<std::shared_ptr<LocalItem>>& items);

}  // namespace mirabel
