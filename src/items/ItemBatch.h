#pragma once

#include <memory>
#include <span>
#include <vector>

#include "items/LocalItem.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Makes items of many entries at the cost of few: they are looked at together and built on two
/// threads. The answer has an element for each URL, in the same order, null where no item can be
/// made of it. Errors: those of `ResourceValueSource::prefetch`, which concern all of them.
[[nodiscard]] Result<std::vector<std::shared_ptr<LocalItem>>> makeItems(const ItemContext& context,
                                                                        std::span<const URL> urls);

}  // namespace mirabel
