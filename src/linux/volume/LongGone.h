#pragma once

#include <chrono>

#include "linux/volume/Database.h"
#include "linux/volume/IdentifierAllocator.h"
#include "linux/volume/IdentityStore.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Forgets objects that have been nowhere for longer than `age`, with all that lay in them: whoever
/// was told of them has an anchor by now that is not valid any more. Their inode numbers count as
/// spent from then on, so that none of their identifiers is given again. A row that is nowhere
/// bears in `place` when that was first noticed, by this, in seconds since 1970. Inside a
/// transaction; does a part of it when there is much. Errors of `ErrorDomain::store`.
[[nodiscard]] Result<void> forgetLongGone(Database& database, IdentityStore& store,
                                          IdentifierAllocator& allocator,
                                          std::chrono::system_clock::time_point now,
                                          std::chrono::seconds age);

}  // namespace mirabel
