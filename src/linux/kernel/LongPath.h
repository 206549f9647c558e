#pragma once

#include <climits>
#include <cstddef>
#include <linux/openat2.h>
#include <string>

#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// The kernel takes paths shorter than this in one go (the terminating NUL counts).
inline constexpr std::size_t longPathThreshold = PATH_MAX;

/// How what lies below an open folder is reached: symbolic links are refused anywhere on the way,
/// and so is another mount. For `openLongPath`.
inline constexpr unsigned long long resolveBeneath =
    RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS | RESOLVE_NO_XDEV;

/// The error for an errno of the kernel's. Its ESTALE, of a server that has forgotten a handle,
/// says nothing of what is there, and becomes EREMOTEIO: here ESTALE says that a name changed
/// hands.
[[nodiscard]] Error kernelError(int errnoValue);

/// The parent of an absolute path, and its last component; "/" and "" for the root.
struct SplitPath {
  std::string parent;
  std::string name;
};
[[nodiscard]] SplitPath splitPath(const std::string& path);

/// An absolute path with "." and ".." taken out of it, as text: right where no component of it is
/// a symbolic link.
[[nodiscard]] std::string withoutDots(const std::string& path);

/// Opens `path`, relative to `directory` unless it is absolute, in as many steps as its length
/// asks for. `resolve` holds RESOLVE_… bits that every step obeys. O_NOFOLLOW and O_CLOEXEC are
/// added. An empty path opens `directory` itself again. POSIX errors.
[[nodiscard]] Result<UniqueFd> openLongPath(int directory, const std::string& path, int flags,
                                            unsigned long long resolve = 0);

}  // namespace mirabel
