#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Writes all of the bytes, in as many calls as it takes. POSIX errors; some of them may be written
/// then.
[[nodiscard]] Result<void> writeAll(int file, std::string_view bytes);
/// The same from `offset` on; the file's position stays.
[[nodiscard]] Result<void> writeAllAt(int file, std::string_view bytes, std::int64_t offset);

/// Replaces the file `name` in an open folder as a whole, or makes it, for its owner alone. It is
/// written beside it under the name with ".new" behind it, synchronised, renamed, and the folder
/// synchronised: after a crash it is the old one or the new one, and the new one once this has
/// returned. POSIX errors; the old one stays, unless only the last of these steps failed. Callers
/// see to it that one of them does it at a time.
[[nodiscard]] Result<void> replaceFile(int folder, const std::string& name, const Data& bytes);

}  // namespace mirabel
