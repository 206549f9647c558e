#pragma once

#include <string_view>

#include "host/ItemLookup.h"
#include "mirabel/Documents.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Opens the file that has the identifier at the end of the call, whatever is moved or saved
/// meanwhile; no symbolic link is followed on the way. Errors: see `Documents::openFile`; POSIX
/// EBUSY where the file is replaced again and again.
[[nodiscard]] Result<UniqueFd> openItemFile(const ItemLookup& lookup, std::string_view identifier,
                                            Documents::Access access);

}  // namespace mirabel
