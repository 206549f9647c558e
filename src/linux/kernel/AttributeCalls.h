#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Extended attributes of `name` in the open folder `folder` (O_PATH will do), a final symbolic
/// link not followed, nothing opened; an empty name means the descriptor's own object. One system
/// call each. Attribute names are the kernel's ("user.…"). A file system that keeps no attributes
/// is one on which none are set. POSIX errors. Any thread may call them.

/// The names, each ended by a NUL, as a view into `buffer`, which grows as needed and is worth
/// keeping from one call to the next.
[[nodiscard]] Result<std::string_view> listAttributes(int folder, const std::string& name,
                                                      std::vector<char>& buffer);
/// ENODATA where there is no such attribute.
[[nodiscard]] Result<std::size_t> attributeSize(int folder, const std::string& name,
                                                const std::string& attribute);
/// ERANGE for a value longer than `size`.
[[nodiscard]] Result<Data> readAttribute(int folder, const std::string& name,
                                         const std::string& attribute, std::size_t size);

/// The namespace in which ordinary users keep attributes.
inline constexpr std::string_view userAttributePrefix = "user.";
/// The names in `list` that are in it, without it.
[[nodiscard]] std::vector<std::string> userAttributeNames(std::string_view list);

}  // namespace mirabel
