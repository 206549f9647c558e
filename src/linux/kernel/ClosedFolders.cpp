#include "linux/kernel/ClosedFolders.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

// The kernel goes through all of a path for each folder on it. Further down than this the next
// folders are reached from an open one, or the time for a deep tree would grow with its square.
constexpr std::size_t longWay = 512;

// The "." is looked up in the folder itself, which asks for the other permission.
bool isClosedAt(int folder, const std::string& path) {
  return ::faccessat(folder, path.c_str(), R_OK, AT_EACCESS) != 0 && errno == EACCES;
}

}  // namespace

bool isClosed(int folder) {
  return isClosedAt(folder, ".");
}

bool leadsThroughClosed(int folder, const std::string& relative) {
  UniqueFd further;
  std::size_t start = 0;
  for (std::size_t end = relative.find('/'); end != std::string::npos;
       end = relative.find('/', end + 1)) {
    const int from = further ? further.get() : folder;
    std::string way = relative.substr(start, end - start);
    if (isClosedAt(from, way + "/.")) return true;
    if (way.size() < longWay) continue;
    UniqueFd opened(::openat(from, way.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!opened) return false;
    further = std::move(opened);
    start = end + 1;
  }
  return false;
}

}  // namespace mirabel
