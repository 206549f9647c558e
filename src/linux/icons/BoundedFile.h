#pragma once

#include <cstddef>
#include <initializer_list>
#include <string>
#include <string_view>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The parts with a slash between each two.
[[nodiscard]] std::string joinedPath(std::initializer_list<std::string_view> parts);

/// Whether a regular file lies there, or a link to one.
[[nodiscard]] bool isRegularFile(const std::string& path);

/// All of a regular file, at an absolute path whose links are followed. Anything else is not
/// opened: a FIFO would block, a device could be set off. POSIX errors; EFBIG beyond `limit` bytes,
/// EINVAL for what is no regular file.
[[nodiscard]] Result<Data> readBoundedFile(const std::string& path, std::size_t limit);

}  // namespace mirabel
