#pragma once

#include <string>

#include "linux/operations/FileCalls.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Whether two objects look like copies of each other: the same kinds and names all the way down,
/// files with the same size and modification time (as far as the file system of `otherFolder` can
/// keep that), links with the same target, the same attributes of users. Contents are not read.
/// POSIX errors.
[[nodiscard]] Result<bool> looksAlike(const FileCalls& calls, int folder, const std::string& name,
                                      int otherFolder, const std::string& otherName);

}  // namespace mirabel
